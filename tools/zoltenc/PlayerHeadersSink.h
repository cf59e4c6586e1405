#pragma once

#include <utility>

#include "zoltenc/SinkDecorator.h"

namespace zolt {

// Gives the stream a sequence parameter set that tells players what the encoder's leaves open.
class PlayerHeadersSink : public SinkDecorator {
public:
    explicit PlayerHeadersSink(std::unique_ptr<PictureSink> next)
        : SinkDecorator(std::move(next)) {}

    void begin(const StreamDescription& stream) override;
};

}  // namespace zolt
