#pragma once

#include "media/ISampleConsumer.h"
#include "media/ISampleProducer.h"
#include "media/abi.h"

// Consumer and producer at once. Owned through this interface: deleted with zolt::Delete.
class ISampleProcessor : public ISampleConsumer, public ISampleProducer {
public:
    ZOLT_INTERFACE_DESTRUCTOR(ISampleProcessor) = default;
};
