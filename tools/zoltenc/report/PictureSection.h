#pragma once

#include <string>

#include "zoltenc/report/ReportPicture.h"

namespace zolt {

// The part of a report about one picture: input and output in the same place, and what the encoder
// decided as layers over them.
class PictureSection {
public:
    // Narrower pictures are enlarged without smoothing.
    static constexpr int kSmallWidth = 640;

    // `number` tells the pictures of a page apart.
    PictureSection(const ReportPicture& picture, int number) : picture_(picture), number_(number) {}

    std::string html() const;

private:
    std::string heading() const;
    std::string control(const char* kind, const char* layer, const char* text, bool is_on) const;
    std::string types_layer() const;
    std::string motion_layer() const;
    std::string qp_layer() const;
    std::string type_counts() const;
    bool has_several_qps() const;

    template <class Value, class Attributes>
    std::string map_layer(const char* layer, const std::vector<Value>& values,
                          Attributes attributes) const;

    const ReportPicture& picture_;
    int number_;
};

}  // namespace zolt
