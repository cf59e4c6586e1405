#pragma once

#include "media/ISampleConsumer.h"
#include "media/ISampleProducer.h"

// Consumer and producer at once. Owned through this interface: its destructor is virtual.
class ISampleProcessor : public ISampleConsumer, public ISampleProducer {
public:
    virtual ~ISampleProcessor() = default;
};
