#include "io/FrameRate.h"

#include <algorithm>
#include <limits>
#include <numeric>

#include "io/PictureTime.h"
#include "io/numbers.h"

namespace zolt {
namespace {

constexpr std::size_t kMaxDecimalPlaces = 6;

std::optional<FrameRate> reduced(std::int64_t numerator, std::int64_t denominator) {
    if (numerator < 1 || denominator < 1) {
        return std::nullopt;
    }
    const std::int64_t common = std::gcd(numerator, denominator);
    const FrameRate rate{numerator / common, denominator / common};
    if (rate.numerator > std::numeric_limits<std::int32_t>::max()) {
        return std::nullopt;
    }
    return rate;
}

std::optional<FrameRate> parse_decimal(std::string_view whole, std::string_view places) {
    if (places.empty() || places.size() > kMaxDecimalPlaces) {
        return std::nullopt;
    }
    const auto integer = parse_number(whole);
    const auto fraction = parse_number(places);
    if (!integer || !fraction) {
        return std::nullopt;
    }
    std::int64_t denominator = 1;
    for (std::size_t place = 0; place < places.size(); ++place) {
        denominator *= 10;
    }
    return reduced(*integer * denominator + *fraction, denominator);
}

}  // namespace

std::optional<FrameRate> FrameRate::parse(std::string_view text) {
    const std::size_t mark = text.find_first_of("/:.");
    if (mark == std::string_view::npos) {
        return reduced(parse_number(text).value_or(0), 1);
    }
    const std::string_view before = text.substr(0, mark);
    const std::string_view after = text.substr(mark + 1);
    if (text[mark] == '.') {
        return parse_decimal(before, after);
    }
    return reduced(parse_number(before).value_or(0), parse_number(after).value_or(0));
}

double FrameRate::per_second() const {
    return static_cast<double>(numerator) / static_cast<double>(denominator);
}

std::int64_t FrameRate::sample_time(std::int64_t index) const {
    return microseconds(index, {denominator, numerator});
}

std::string FrameRate::to_string() const {
    const std::string text = std::to_string(numerator);
    return denominator == 1 ? text : text + "/" + std::to_string(denominator);
}

}  // namespace zolt
