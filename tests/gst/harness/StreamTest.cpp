#include <gtest/gtest.h>

#include "ElementHarness.h"
#include "avc/SequenceParameterSet.h"
#include "avc/rbsp.h"
#include "common/Decoder.h"
#include "common/Encoding.h"
#include "pictures.h"

namespace zolt_test {
namespace {

constexpr const char* kOnlyAvc = "video/x-h264,stream-format=avc";

GstVideoInfo i420(int width, int height) {
    GstVideoInfo info;
    gst_video_info_set_format(&info, GST_VIDEO_FORMAT_I420, static_cast<guint>(width),
                              static_cast<guint>(height));
    return info;
}

std::string i420_fields(int width, int height, const std::string& rest = "framerate=30/1") {
    return "format=I420,width=" + std::to_string(width) + ",height=" + std::to_string(height) +
           "," + rest;
}

// The left upper part of a planar picture whose rows have `coded_width` luma samples.
std::vector<std::uint8_t> shown_part(const std::vector<std::uint8_t>& planar, int coded_width,
                                     int coded_height, int width, int height) {
    std::vector<std::uint8_t> part;
    const std::uint8_t* plane = planar.data();
    for (const int shift : {0, 1, 1}) {
        for (int y = 0; y < height >> shift; ++y) {
            const std::uint8_t* const row = plane + y * (coded_width >> shift);
            part.insert(part.end(), row, row + (width >> shift));
        }
        plane += (coded_width >> shift) * (coded_height >> shift);
    }
    return part;
}

// The parameter sets of an AVC decoder configuration record, ISO/IEC 14496-15, clause 5.3.3.1.
Units sets_of(const std::string& hex) {
    std::vector<std::uint8_t> record;
    for (std::size_t i = 0; i + 1 < hex.size(); i += 2) {
        record.push_back(static_cast<std::uint8_t>(std::stoi(hex.substr(i, 2), nullptr, 16)));
    }
    Units sets;
    std::size_t position = 5;
    for (const unsigned mask : {0x1Fu, 0xFFu}) {
        const unsigned count = record.at(position++) & mask;
        EXPECT_EQ(count, 1u);
        const std::size_t size = record.at(position) << 8 | record.at(position + 1);
        const auto start = record.begin() + static_cast<std::ptrdiff_t>(position + 2);
        sets.emplace_back(start, start + static_cast<std::ptrdiff_t>(size));
        position += 2 + size;
    }
    EXPECT_EQ(position, record.size());
    EXPECT_EQ(record[0], 1);
    EXPECT_EQ(record[1], sets[0][1]);
    EXPECT_EQ(record[2], sets[0][2]);
    EXPECT_EQ(record[3], sets[0][3]);
    EXPECT_EQ(record[4], 0xFF);
    return sets;
}

zolt::SequenceParameterSet parsed(const std::vector<std::uint8_t>& nal) {
    return zolt::SequenceParameterSet::read(
        zolt::rbsp_bytes(nal.data(), static_cast<int>(nal.size()), 4096));
}

void send_set(Decoder& decoder, const std::vector<std::uint8_t>& nal) {
    decoder.send_parameter_set(nal.data(), static_cast<int>(nal.size()));
}

// Both stream formats, whole and odd sizes: what a decoder shows is the engine's reconstruction.
TEST(Stream, DecodesToTheReconstruction) {
    for (const bool with_start_codes : {true, false}) {
        for (const auto& [width, height] : {std::pair{96, 80}, {70, 50}, {33, 47}, {16, 16}}) {
            SCOPED_TRACE(std::to_string(width) + "x" + std::to_string(height) +
                         (with_start_codes ? " byte-stream" : " avc"));
            const ElementHarness element("bitrate=0 key-int-max=5",
                                         with_start_codes ? "" : kOnlyAvc);
            ASSERT_TRUE(element.set_caps(i420_fields(width, height)));
            const int shown_width = (width + 1) / 2 * 2;
            const int shown_height = (height + 1) / 2 * 2;
            EXPECT_EQ(element.output_field("width"), std::to_string(shown_width));
            EXPECT_EQ(element.output_field("height"), std::to_string(shown_height));

            const int coded_width = (width + 15) / 16 * 16;
            const int coded_height = (height + 15) / 16 * 16;
            Settings settings;
            settings.intra_period = 5;
            Encoding engine(coded_width, coded_height, settings);
            Decoder decoder(shown_width, shown_height);
            if (!with_start_codes) {
                for (const auto& set : sets_of(element.output_field("codec_data"))) {
                    send_set(decoder, set);
                }
            }
            for (int n = 0; n < 12; ++n) {
                ASSERT_EQ(element.push(n), GST_FLOW_OK);
                const std::vector<Output> outputs = element.take();
                ASSERT_EQ(outputs.size(), 1u);
                EXPECT_EQ(outputs[0].is_key, n % 5 == 0);
                EXPECT_EQ(outputs[0].pts,
                          gst_util_uint64_scale_int(static_cast<guint64>(n) * GST_SECOND, 1, 30));
                EXPECT_EQ(outputs[0].dts, outputs[0].pts);
                EXPECT_EQ(outputs[0].duration, GST_SECOND / 30);
                Units units = units_of(outputs[0].bytes, with_start_codes);
                ASSERT_EQ(units.size(), with_start_codes && n % 5 == 0 ? 3u : 1u);
                for (std::size_t set = 0; set + 1 < units.size(); ++set) {
                    send_set(decoder, units[set]);
                }
                engine.encode(padded_i420(i420(width, height), n).data());
                decoder.send_picture(units.back().data(), static_cast<int>(units.back().size()),
                                     shown_part(engine.reconstruction(), coded_width, coded_height,
                                                shown_width, shown_height));
            }
            EXPECT_EQ(decoder.finish(), "");
        }
    }
}

TEST(Stream, CapsSayWhatTheParameterSetsSay) {
    struct Case {
        int width, height;
        const char* rest;
        const char* bit_rate;
        const char* level;
    };
    // Table A-1, by the macroblocks of a picture and of a second, and by the bit rate.
    const Case cases[] = {
        {176, 144, "framerate=15/1", "64", "1"},    {176, 144, "framerate=15/1", "500", "1.3"},
        {176, 144, "framerate=15/1", "0", "2.1"},   {352, 288, "framerate=30/1", "700", "1.3"},
        {640, 480, "framerate=30/1", "1000", "3"},  {1280, 720, "framerate=30/1", "1000", "3.1"},
        {1280, 720, "framerate=60/1", "1", "3.2"},  {1920, 1080, "framerate=30/1", "4000", "4"},
        {640, 480, "framerate=0/1", "1000", "2.2"},
    };
    for (const Case& a_case : cases) {
        SCOPED_TRACE(std::to_string(a_case.width) + " " + a_case.rest + " " + a_case.bit_rate);
        const ElementHarness element(std::string("bitrate=") + a_case.bit_rate, kOnlyAvc);
        ASSERT_TRUE(element.set_caps(i420_fields(a_case.width, a_case.height, a_case.rest)));
        EXPECT_EQ(element.output_field("level"), a_case.level);
        EXPECT_EQ(element.output_field("profile"), "main");
        EXPECT_EQ(element.output_field("alignment"), "au");
        EXPECT_EQ(element.output_field("stream-format"), "avc");
        const auto sps = parsed(sets_of(element.output_field("codec_data"))[0]);
        EXPECT_TRUE(sps.is_complete);
        EXPECT_EQ(sps.profile_idc, 77u);
    }
}

TEST(Stream, ColoursAndShapesArePassedOn) {
    struct Case {
        const char* fields;
        const char* colorimetry;
        const char* shape;
    };
    const Case cases[] = {
        {"format=I420,colorimetry=bt709", "bt709", "1/1"},
        {"format=I420,colorimetry=bt601,pixel-aspect-ratio=12/11", "bt601", "12/11"},
        {"format=I420,colorimetry=1:4:0:0", "1:4:0:0", "1/1"},
        {"format=YUY2,colorimetry=bt2020,pixel-aspect-ratio=4/3", "bt2020", "4/3"},
        // RGB is converted in full range with the weights of BT.601.
        {"format=BGRx,pixel-aspect-ratio=1/1", "1:4:7:1", "1/1"},
    };
    for (const Case& a_case : cases) {
        SCOPED_TRACE(a_case.fields);
        const ElementHarness element;
        ASSERT_TRUE(
            element.set_caps(std::string(a_case.fields) + ",width=64,height=48,framerate=25/1"));
        EXPECT_EQ(element.output_field("colorimetry"), a_case.colorimetry);
        EXPECT_EQ(element.output_field("pixel-aspect-ratio"), a_case.shape);
        EXPECT_EQ(element.output_field("framerate"), "25/1");
    }
}

TEST(Stream, GoesOnWithOtherCaps) {
    const ElementHarness element("bitrate=0", kOnlyAvc);
    struct Part {
        const char* format;
        int width, height;
        const char* rate;
    };
    const Part parts[] = {{"I420", 64, 48, "30/1"},
                          {"I420", 100, 60, "30/1"},
                          {"RGB", 100, 60, "30/1"},
                          {"RGB", 100, 60, "60/1"},
                          {"I420", 64, 48, "30/1"}};
    std::string last_sets;
    for (const Part& part : parts) {
        SCOPED_TRACE(part.format + (" " + std::to_string(part.width)) + " " + part.rate);
        ASSERT_TRUE(element.set_caps(
            std::string("format=") + part.format + ",width=" + std::to_string(part.width) +
            ",height=" + std::to_string(part.height) + ",framerate=" + part.rate));
        const std::string sets = element.output_field("codec_data");
        EXPECT_NE(sets, last_sets);
        last_sets = sets;
        EXPECT_EQ(element.output_field("width"), std::to_string(part.width));
        EXPECT_EQ(element.output_field("framerate"), part.rate);
        EXPECT_EQ(element.types(0, 3), "KPPP");
    }
}

// Parameter sets go elsewhere then, so the new reader's stream begins with them.
TEST(Stream, ReaderMayWantTheOtherFormat) {
    const ElementHarness element("", kOnlyAvc);
    ASSERT_TRUE(element.set_caps(i420_fields(64, 48)));
    EXPECT_EQ(element.types(0, 2), "KPP");
    for (const bool with_start_codes : {true, false}) {
        gst_harness_set_sink_caps_str(
            element.harness(),
            with_start_codes ? "video/x-h264,stream-format=byte-stream" : kOnlyAvc);
        gst_harness_push_upstream_event(element.harness(), gst_event_new_reconfigure());
        ASSERT_EQ(element.push(3), GST_FLOW_OK);
        EXPECT_EQ(element.output_field("stream-format"), with_start_codes ? "byte-stream" : "avc");
        EXPECT_EQ(element.output_field("codec_data").empty(), with_start_codes);
        const std::vector<Output> outputs = element.take();
        ASSERT_EQ(outputs.size(), 1u);
        EXPECT_TRUE(outputs[0].is_key);
        EXPECT_EQ(units_of(outputs[0].bytes, with_start_codes).size(), with_start_codes ? 3u : 1u);
        EXPECT_EQ(element.types(4, 5), "PP");
    }
}

// A reader that is looked at anew and wants the same gets the stream that it had.
TEST(Stream, GoesOnForTheSameReader) {
    const ElementHarness element("", kOnlyAvc);
    ASSERT_TRUE(element.set_caps(i420_fields(64, 48)));
    EXPECT_EQ(element.types(0, 2), "KPP");
    gst_harness_push_upstream_event(element.harness(), gst_event_new_reconfigure());
    EXPECT_EQ(element.types(3, 5), "PPP");
}

TEST(Stream, EndsWithItsLastPicture) {
    const ElementHarness element;
    ASSERT_TRUE(element.set_caps(i420_fields(64, 48)));
    EXPECT_EQ(element.types(0, 2), "KPP");
    ASSERT_TRUE(gst_harness_push_event(element.harness(), gst_event_new_eos()));
    EXPECT_TRUE(element.take().empty());
    bool ended = false;
    while (GstEvent* const event = gst_harness_try_pull_event(element.harness())) {
        ended = ended || GST_EVENT_TYPE(event) == GST_EVENT_EOS;
        gst_event_unref(event);
    }
    EXPECT_TRUE(ended);
}

// What a probe does when the element asks downstream for buffers: another reader takes over.
GstPadProbeReturn change_reader(GstPad* pad, GstPadProbeInfo* info, gpointer harness) {
    if (GST_QUERY_TYPE(GST_PAD_PROBE_INFO_QUERY(info)) != GST_QUERY_ALLOCATION) {
        return GST_PAD_PROBE_OK;
    }
    auto* const of_harness = static_cast<GstHarness*>(harness);
    gst_pad_remove_probe(pad, GST_PAD_PROBE_INFO_ID(info));
    gst_harness_set_sink_caps_str(of_harness, "video/x-h264,stream-format=byte-stream");
    gst_harness_push_upstream_event(of_harness, gst_event_new_reconfigure());
    return GST_PAD_PROBE_OK;
}

// A larger bit rate has the caps sent anew after its key frame has been coded.
TEST(Stream, ReaderMayChangeWhileAPictureIsCoded) {
    const ElementHarness element("bitrate=100 key-int-max=2", kOnlyAvc);
    ASSERT_TRUE(element.set_caps(i420_fields(320, 240)));
    EXPECT_EQ(element.types(0, 1), "KP");
    gst_pad_add_probe(element.harness()->sinkpad, GST_PAD_PROBE_TYPE_QUERY_DOWNSTREAM,
                      change_reader, element.harness(), nullptr);
    g_object_set(element.element(), "bitrate", 4000, nullptr);
    ASSERT_EQ(element.push(2), GST_FLOW_OK);
    EXPECT_EQ(element.output_field("stream-format"), "byte-stream");
    const std::vector<Output> outputs = element.take();
    ASSERT_EQ(outputs.size(), 1u);
    EXPECT_EQ(units_of(outputs[0].bytes, true).size(), 3u);
}

GstPadProbeReturn refuse(GstPad*, GstPadProbeInfo* info, gpointer) {
    gst_buffer_unref(GST_PAD_PROBE_INFO_BUFFER(info));
    GST_PAD_PROBE_INFO_FLOW_RETURN(info) = GST_FLOW_NOT_LINKED;
    return GST_PAD_PROBE_HANDLED;
}

// Pictures that nobody got are nothing that later ones may refer to.
TEST(Stream, BeginsAnewAfterPicturesThatWereNotTaken) {
    const ElementHarness element;
    ASSERT_TRUE(element.set_caps(i420_fields(64, 48)));
    EXPECT_EQ(element.types(0, 2), "KPP");
    GstPad* const source = gst_element_get_static_pad(element.element(), "src");
    const gulong probe =
        gst_pad_add_probe(source, GST_PAD_PROBE_TYPE_BUFFER, refuse, nullptr, nullptr);
    EXPECT_EQ(element.push(3), GST_FLOW_NOT_LINKED);
    EXPECT_EQ(element.push(4), GST_FLOW_NOT_LINKED);
    gst_pad_remove_probe(source, probe);
    gst_object_unref(source);
    EXPECT_EQ(element.types(5, 7), "KPP");
}

GstPadProbeReturn refuse_caps(GstPad*, GstPadProbeInfo* info, gpointer) {
    GstQuery* const query = GST_PAD_PROBE_INFO_QUERY(info);
    if (GST_QUERY_TYPE(query) != GST_QUERY_ACCEPT_CAPS) {
        return GST_PAD_PROBE_OK;
    }
    gst_query_set_accept_caps_result(query, FALSE);
    return GST_PAD_PROBE_HANDLED;
}

TEST(Stream, GoesOnAfterCapsThatTheReaderRefuses) {
    const ElementHarness element;
    ASSERT_TRUE(element.set_caps(i420_fields(64, 48)));
    EXPECT_EQ(element.types(0, 2), "KPP");
    const gulong probe =
        gst_pad_add_probe(element.harness()->sinkpad, GST_PAD_PROBE_TYPE_QUERY_DOWNSTREAM,
                          refuse_caps, nullptr, nullptr);
    element.set_caps(i420_fields(640, 480));
    EXPECT_EQ(element.push(3), GST_FLOW_NOT_NEGOTIATED);
    gst_pad_remove_probe(element.harness()->sinkpad, probe);
    ASSERT_TRUE(element.set_caps(i420_fields(64, 48)));
    EXPECT_EQ(element.types(4, 6), "KPP");
    EXPECT_EQ(element.output_field("width"), "64");
    EXPECT_EQ(element.error(), "");
}

TEST(Stream, TimesMayBeMissingOrJump) {
    const ElementHarness element("bitrate=100");
    ASSERT_TRUE(element.set_caps(i420_fields(64, 48, "framerate=0/1")));
    const GstClockTime times[] = {0,
                                  GST_CLOCK_TIME_NONE,
                                  GST_CLOCK_TIME_NONE,
                                  5 * GST_SECOND,
                                  5 * GST_SECOND,
                                  4 * GST_SECOND,
                                  3600 * GST_SECOND};
    const GstVideoInfo info = i420(64, 48);
    int n = 0;
    for (const GstClockTime time : times) {
        GstBuffer* const buffer = moving_picture(info, n++);
        GST_BUFFER_PTS(buffer) = time;
        ASSERT_EQ(element.push(buffer), GST_FLOW_OK);
    }
    EXPECT_EQ(element.take().size(), std::size(times));
}

}  // namespace
}  // namespace zolt_test
