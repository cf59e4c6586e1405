#pragma once

#include <string>
#include <vector>

namespace zolt {

// A plot over the time of a stream, as a figure for an HTML page. The curves are SVG that fills the
// width there is; the labels are text beside it, which keeps its size.
class SvgPlot {
public:
    struct Point {
        double x, y;  // x in seconds
    };
    using Points = std::vector<Point>;

    // The unit is part of the title's line. The horizontal axis goes from `begin` to `end` seconds;
    // with `from_zero` the vertical axis begins there.
    SvgPlot(std::string title, std::string unit, double begin, double end, bool from_zero)
        : title_(std::move(title)),
          unit_(std::move(unit)),
          begin_(begin),
          end_(end),
          from_zero_(from_zero) {}

    // Points in ascending order of x. Those that are not finite are left out. Of many that would
    // share a column of the screen the highest and the lowest are drawn.
    void add_line(std::string name, Points points);
    void add_marks(std::string name, Points points);

    // A level that the lines are to be compared with.
    void add_level(std::string name, double y);

    std::string html() const;

private:
    enum class Kind { line, marks, level };
    struct Series {
        Kind kind;
        std::string name;
        Points points;
    };
    struct Axis {
        double low, high, step;
        double share(double value) const { return (value - low) / (high - low); }
        std::vector<double> ticks() const;
    };

    Axis time_axis() const;
    Axis value_axis() const;
    static std::string path(const Series& series, const Axis& time, const Axis& values);
    static const char* style_of(Kind kind);

    std::string title_;
    std::string unit_;
    double begin_;
    double end_;
    bool from_zero_;
    std::vector<Series> series_;
};

}  // namespace zolt
