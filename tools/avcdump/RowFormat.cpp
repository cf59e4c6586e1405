#include "avcdump/RowFormat.h"

#include <array>
#include <cinttypes>
#include <cstdio>

namespace zolt {
namespace {

constexpr std::size_t kMaxLine = 400;

// The values of a row as text, those that a unit lacks as `none`.
struct RowTexts {
    RowTexts(const UnitRow& unit, const char* none)
        : first_mb(none), slice_type(none), frame_num(none), idr_pic_id(none), lsb(none), qp(none) {
        static constexpr const char* kSliceTypes[] = {"P", "B", "I", "SP", "SI"};
        if (!unit.header) {
            return;
        }
        first_mb = std::to_string(unit.header->first_mb_in_slice);
        slice_type = kSliceTypes[unit.header->slice_type];
        if (!unit.header->is_complete) {
            return;
        }
        frame_num = std::to_string(unit.header->frame_num);
        if (unit.header->is_idr) {
            idr_pic_id = std::to_string(unit.header->idr_pic_id);
        }
        if (unit.header->pic_order_cnt_lsb) {
            lsb = std::to_string(*unit.header->pic_order_cnt_lsb);
        }
        qp = std::to_string(unit.header->slice_qp);
    }

    std::string first_mb;
    std::string slice_type;
    std::string frame_num;
    std::string idr_pic_id;
    std::string lsb;
    std::string qp;
};

class Table : public RowFormat {
public:
    std::string head() const override {
        return "    OFFSET     SIZE TYPE               PICTURE         TIME SYNC FIRST_MB SLICE "
               "FRAME_NUM"
               " IDR_PIC_ID POC_LSB  QP\n";
    }

    std::string row(const UnitRow& unit) override {
        const RowTexts texts(unit, "-");
        std::array<char, kMaxLine> line;
        const int length = std::snprintf(
            line.data(), line.size(),
            "%10" PRId64 " %8d %2d %-15s %7" PRId64 " %5" PRId64
            ".%06d %-4s %8s %-5s %9s %10s %7s %3s\n",
            unit.offset, unit.size, unit.type, UnitLister::type_name(unit.type), unit.picture,
            unit.time / kMicroseconds, static_cast<int>(unit.time % kMicroseconds),
            unit.is_sync ? "sync" : "-", texts.first_mb.c_str(), texts.slice_type.c_str(),
            texts.frame_num.c_str(), texts.idr_pic_id.c_str(), texts.lsb.c_str(), texts.qp.c_str());
        return {line.data(), static_cast<std::size_t>(length)};
    }

    std::string tail(const StreamSummary& summary) const override {
        std::array<char, kMaxLine> line;
        int length = std::snprintf(
            line.data(), line.size(),
            "%" PRId64 " units, %" PRId64 " pictures (%" PRId64 " IDR), %" PRId64 " bytes",
            summary.units, summary.pictures, summary.idr_pictures, summary.bytes);
        std::string text(line.data(), static_cast<std::size_t>(length));
        if (summary.kbits_per_second) {
            length =
                std::snprintf(line.data(), line.size(), ", %.2f kbit/s at %s frames/s",
                              *summary.kbits_per_second, summary.frame_rate.to_string().c_str());
            text.append(line.data(), static_cast<std::size_t>(length));
        }
        return text + "\n";
    }

private:
    static constexpr int kMicroseconds = 1000000;  // per second
};

class Json : public RowFormat {
public:
    std::string head() const override { return "{\"units\": ["; }

    std::string row(const UnitRow& unit) override {
        const RowTexts texts(unit, "null");
        const std::string slice_type =
            unit.header ? '"' + texts.slice_type + '"' : texts.slice_type;
        std::array<char, kMaxLine> line;
        const int length = std::snprintf(
            line.data(), line.size(),
            "%s\n  {\"offset\": %" PRId64
            ", \"size\": %d, \"type\": %d, \"type_name\": \"%s\", \"picture\": %" PRId64
            ", \"time_us\": %" PRId64
            ", \"sync\": %s, \"first_mb\": %s, \"slice_type\": %s, \"frame_num\": %s, "
            "\"idr_pic_id\": %s, \"pic_order_cnt_lsb\": %s, \"qp\": %s}",
            is_first_ ? "" : ",", unit.offset, unit.size, unit.type,
            UnitLister::type_name(unit.type), unit.picture, unit.time,
            unit.is_sync ? "true" : "false", texts.first_mb.c_str(), slice_type.c_str(),
            texts.frame_num.c_str(), texts.idr_pic_id.c_str(), texts.lsb.c_str(), texts.qp.c_str());
        is_first_ = false;
        return {line.data(), static_cast<std::size_t>(length)};
    }

    std::string tail(const StreamSummary& summary) const override {
        std::array<char, kMaxLine> line;
        int length =
            std::snprintf(line.data(), line.size(), "%.3f", summary.kbits_per_second.value_or(0));
        const std::string rate = summary.kbits_per_second
                                     ? std::string(line.data(), static_cast<std::size_t>(length))
                                     : "null";
        length = std::snprintf(line.data(), line.size(),
                               "\n], \"summary\": {\"units\": %" PRId64 ", \"pictures\": %" PRId64
                               ", \"idr_pictures\": %" PRId64 ", \"bytes\": %" PRId64
                               ", \"fps\": \"%s\", \"kbits_per_second\": %s}}\n",
                               summary.units, summary.pictures, summary.idr_pictures, summary.bytes,
                               summary.frame_rate.to_string().c_str(), rate.c_str());
        return {line.data(), static_cast<std::size_t>(length)};
    }

private:
    bool is_first_ = true;
};

class Csv : public RowFormat {
public:
    std::string head() const override {
        return "offset,size,type,type_name,picture,time_us,sync,first_mb,slice_type,frame_num,"
               "idr_pic_id,pic_order_cnt_lsb,qp\n";
    }

    std::string row(const UnitRow& unit) override {
        const RowTexts texts(unit, "");
        std::array<char, kMaxLine> line;
        const int length = std::snprintf(
            line.data(), line.size(),
            "%" PRId64 ",%d,%d,%s,%" PRId64 ",%" PRId64 ",%d,%s,%s,%s,%s,%s,%s\n", unit.offset,
            unit.size, unit.type, UnitLister::type_name(unit.type), unit.picture, unit.time,
            unit.is_sync ? 1 : 0, texts.first_mb.c_str(), texts.slice_type.c_str(),
            texts.frame_num.c_str(), texts.idr_pic_id.c_str(), texts.lsb.c_str(), texts.qp.c_str());
        return {line.data(), static_cast<std::size_t>(length)};
    }

    std::string tail(const StreamSummary&) const override { return ""; }
};

}  // namespace

std::unique_ptr<RowFormat> RowFormat::table() {
    return std::make_unique<Table>();
}

std::unique_ptr<RowFormat> RowFormat::json() {
    return std::make_unique<Json>();
}

std::unique_ptr<RowFormat> RowFormat::csv() {
    return std::make_unique<Csv>();
}

}  // namespace zolt
