#include "zoltenc/report/SvgPlot.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <utility>

#include "zoltenc/report/markup.h"

namespace zolt {
namespace {

// Units of the drawing; it is stretched to what room there is.
constexpr double kWidth = 1000;
constexpr double kHeight = 200;
constexpr int kColumns = 500;  // at most two points each

// The smallest of 1, 2, 5, 10, ... that is at least `least`.
double round_step(double least) {
    const double power = std::pow(10, std::floor(std::log10(least)));
    for (const double factor : {1.0, 2.0, 5.0}) {
        if (factor * power >= least * (1 - 1e-9)) {
            return factor * power;
        }
    }
    return 10 * power;
}

std::string tick_text(double value, double step) {
    const int decimals = step >= 1 ? 0 : static_cast<int>(std::ceil(-std::log10(step) - 1e-9));
    return formatted("%.*f", decimals, value == 0 ? 0.0 : value);
}

// The highest and the lowest point of each column, in their order.
SvgPlot::Points thinned(const SvgPlot::Points& points, double low, double high) {
    if (points.size() <= 2 * static_cast<std::size_t>(kColumns)) {
        return points;
    }
    SvgPlot::Points result;
    const auto column = [&](const SvgPlot::Point& point) {
        return static_cast<int>((point.x - low) / (high - low) * kColumns);
    };
    for (auto begin = points.begin(); begin != points.end();) {
        const auto end = std::find_if(begin, points.end(), [&](const SvgPlot::Point& point) {
            return column(point) != column(*begin);
        });
        auto [least, most] = std::minmax_element(
            begin, end, [](const SvgPlot::Point& a, const SvgPlot::Point& b) { return a.y < b.y; });
        if (most < least) {
            std::swap(least, most);
        }
        result.push_back(*least);
        if (most != least) {
            result.push_back(*most);
        }
        begin = end;
    }
    return result;
}

}  // namespace

void SvgPlot::add_line(std::string name, Points points) {
    points.erase(std::remove_if(points.begin(), points.end(),
                                [](const Point& point) { return !std::isfinite(point.y); }),
                 points.end());
    series_.push_back({Kind::line, std::move(name), std::move(points)});
}

void SvgPlot::add_marks(std::string name, Points points) {
    add_line(std::move(name), std::move(points));
    series_.back().kind = Kind::marks;
}

void SvgPlot::add_level(std::string name, double y) {
    series_.push_back({Kind::level, std::move(name), {{0, y}}});
}

std::string SvgPlot::html() const {
    const Axis time = time_axis();
    const Axis values = value_axis();
    std::string drawing = "<path class=\"grid\" d=\"";
    std::string labels;
    for (const double y : values.ticks()) {
        const double down = 1 - values.share(y);
        drawing += formatted("M0 %.1fh%g", down * kHeight, kWidth);
        labels += formatted("<span class=\"y\" style=\"top:%.2f%%\">", 100 * down) +
                  tick_text(y, values.step) + "</span>";
    }
    drawing += "\"/>";
    for (const double x : time.ticks()) {
        labels += formatted("<span class=\"x\" style=\"left:%.2f%%\">", 100 * time.share(x)) +
                  tick_text(x, time.step) + "</span>";
    }
    std::string legend;
    for (const Series& series : series_) {
        const std::string style = style_of(series.kind);
        drawing += "<path class=\"" + style + "\" d=\"" + path(series, time, values) + "\"/>";
        legend += "<span class=\"key\"><i class=\"" + style + "\"></i>" + escaped(series.name) +
                  "</span>";
    }
    return "<figure class=\"plot\"><figcaption><b>" + escaped(title_) + "</b> <span>" +
           escaped(unit_) + "</span>" + legend +
           formatted(
               "</figcaption><div class=\"axes\"><svg viewBox=\"0 0 %g %g\" "
               "preserveAspectRatio=\"none\" role=\"img\" aria-label=\"",
               kWidth, kHeight) +
           escaped(title_) + "\">" + drawing + "</svg>" + labels +
           "</div><div class=\"below\">time in the stream, s</div></figure>\n";
}

// Marks are lines of no length with round ends, which stay round however the drawing is stretched.
std::string SvgPlot::path(const Series& series, const Axis& time, const Axis& values) {
    const auto down = [&](double y) { return (1 - values.share(y)) * kHeight; };
    if (series.kind == Kind::level) {
        return formatted("M0 %.1fh%g", down(series.points[0].y), kWidth);
    }
    const bool is_line = series.kind == Kind::line;
    std::string text;
    for (const Point& point : thinned(series.points, time.low, time.high)) {
        text += is_line && !text.empty() ? 'L' : 'M';
        text += formatted("%.1f %.1f", time.share(point.x) * kWidth, down(point.y));
        text += is_line ? "" : "h0";
    }
    return text;
}

const char* SvgPlot::style_of(Kind kind) {
    switch (kind) {
        case Kind::line:
            return "line";
        case Kind::marks:
            return "marks";
        case Kind::level:
            break;
    }
    return "level";
}

// The multiples of the step on the axis.
std::vector<double> SvgPlot::Axis::ticks() const {
    constexpr double kRounding = 1e-6;
    const auto first = static_cast<std::int64_t>(std::ceil(low / step - kRounding));
    const auto last = static_cast<std::int64_t>(std::floor(high / step + kRounding));
    std::vector<double> result;
    for (std::int64_t i = first; i <= last; ++i) {
        result.push_back(static_cast<double>(i) * step);
    }
    return result;
}

SvgPlot::Axis SvgPlot::time_axis() const {
    constexpr double kTicks = 6;
    constexpr double kShortest = 1e-3;
    const double end = std::max(end_, begin_ + kShortest);
    return {begin_, end, round_step((end - begin_) / kTicks)};
}

SvgPlot::Axis SvgPlot::value_axis() const {
    double low = HUGE_VAL;
    double high = -HUGE_VAL;
    for (const Series& series : series_) {
        for (const Point& point : series.points) {
            low = std::min(low, point.y);
            high = std::max(high, point.y);
        }
    }
    if (!(low <= high)) {
        low = high = 0;
    }
    low = from_zero_ ? std::min(low, 0.0) : low;
    high = std::max(high, low + (from_zero_ ? 1e-3 : 1));
    constexpr double kTicks = 4;
    const double step = round_step((high - low) / kTicks);
    return {std::floor(low / step) * step, std::ceil(high / step - 1e-9) * step, step};
}

}  // namespace zolt
