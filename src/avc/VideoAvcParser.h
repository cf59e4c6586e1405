#pragma once

#include <cstdint>
#include <cstdio>
#include <functional>
#include <utility>
#include <vector>

#include "media/IConfigVideoAvc.h"
#include "media/ISampleProducer.h"
#include "media/MediaSample.h"
#include "media/MediaStreamConfig.h"

// Leading fields of a sequence parameter set, named as in clause 7.3.2.1.
struct VideoAvcSeqParSet {
    std::uint32_t profile_idc = 0;
    std::uint32_t level_idc = 0;
    std::uint32_t seq_parameter_set_id = 0;
    std::uint32_t log2_max_frame_num_minus4 = 0;
    std::uint32_t pic_order_cnt_type = 0;
    std::uint32_t log2_max_pic_order_cnt_lsb_minus4 = 0;
    std::uint8_t delta_pic_order_always_zero_flag = 0;
    std::uint32_t num_ref_frames = 0;
    std::uint8_t gaps_in_frame_num_value_allowed_flag = 0;
    std::uint32_t pic_width_in_mbs_minus1 = 0;
    std::uint32_t pic_height_in_map_units_minus1 = 0;
    std::uint8_t frame_mbs_only_flag = 0;
};

// Leading fields of a picture parameter set, named as in clause 7.3.2.2.
struct VideoAvcPicParSet {
    std::uint32_t pic_parameter_set_id = 0;
    std::uint32_t seq_parameter_set_id = 0;
    std::uint8_t entropy_coding_mode_flag = 0;
    std::uint8_t pic_order_present_flag = 0;
    std::uint32_t num_slice_groups_minus1 = 0;
};

// Leading fields of a slice header, named as in clause 7.3.3; those that a slice lacks are 0.
struct VideoAvcSliceHeader {
    std::uint32_t first_mb_in_slice = 0;
    std::uint32_t slice_type = 0;
    std::uint32_t pic_parameter_set_id = 0;
    std::uint32_t frame_num = 0;
    std::uint32_t idr_pic_id = 0;
    std::uint32_t pic_order_cnt_lsb = 0;
};

// Splits an AVC byte stream (Annex B), fed in pieces of any size, into one sample per NAL unit.
//
// Nothing is delivered until the first sequence and the first picture parameter set have been
// captured: those two units and every other one before the later of them are left out. From there
// on every unit of whatever type is a sample, whose data is the unit with its start code and whose
// time counts one frame period per unit. Samples are delivered inside PutNextAvcData and Flush, on
// the caller's thread; their data is valid during PutSample only, and neither the consumer nor the
// unit listener may feed the parser from there.
//
// Any bytes are accepted and nothing is reported: fields that a damaged unit lacks are 0. A byte is
// copied and examined a constant number of times, however the stream is cut up, and the memory held
// is proportional to the longest unit or piece. A unit is at most INT_MAX bytes; what is fed beyond
// that before its end is found is lost.
class VideoAvcParser : public ISampleProducer, public IConfigVideoAvc {
public:
    static constexpr int StartCode3Length = 3;
    static constexpr int StartCode4Length = 4;
    static constexpr unsigned char StartCode3Bytes[StartCode3Length] = {0, 0, 1};
    static constexpr unsigned char StartCode4Bytes[StartCode4Length] = {0, 0, 0, 1};

    using UnitListener = std::function<void(const unsigned char* unit, int size)>;

    // Stream description of this object as IConfigVideoAvc, media type avc1.
    ISampleStreamConfig* GetSampleStreamConfig() override { return &streamConfig; }
    // Replaces the consumer, which stays the caller's, and returns what it answers to the stream
    // configuration; 0 for null.
    int Connect(ISampleConsumer* newConsumer) override;
    // Nothing unless `oldConsumer` is the connected one.
    void Disconnect(ISampleConsumer* oldConsumer) override;

    virtual ~VideoAvcParser() = default;

    // From the first sequence parameter set, in luma samples: map units times 16, so the height of
    // a field for interlaced streams, before cropping. 0 until known and for sizes beyond 65535
    // macroblocks.
    int GetWidth() override { return width; }
    int GetHeight() override { return height; }
    // As given at construction.
    double GetFrameRate() override { return frameRate; }
    // The first parameter sets, without start code; null and 0 until seen.
    unsigned char* GetSeqParSetData() override;
    int GetSeqParSetSize() override { return static_cast<int>(seqParSetData.size()); }
    unsigned char* GetPicParSetData() override;
    int GetPicParSetSize() override { return static_cast<int>(picParSetData.size()); }

    // `newConsumer` may be null and stays the caller's. `framesPerSecond` gives the sample times;
    // with 0 all times are 0.
    VideoAvcParser(ISampleConsumer* newConsumer, double framesPerSecond);
    VideoAvcParser(const VideoAvcParser&) = delete;
    VideoAvcParser& operator=(const VideoAvcParser&) = delete;

    // Appends `len` bytes of the stream and delivers every unit that they complete. A unit is
    // complete when the next start code has been seen. While fewer than 8 bytes are held nothing
    // is looked at. A length of 0 looks at what AddDataToBuffer has left.
    void PutNextAvcData(const unsigned char* data, int len);

    // Delivers what is held as the last sample, whether or not the parameter sets have been seen,
    // with the sync flag of the unit before it, and signals the end. Without a consumer the held
    // bytes are dropped.
    void Flush();

    // Appends only. Nothing for null or a length below 1.
    void AddDataToBuffer(const unsigned char* data, int len);

    // Bytes of the stream before the first unit that becomes a sample, at most INT_MAX; -1 until
    // both parameter sets have been captured.
    int GetFirstSampleOffset() const { return HoldsParSets() ? firstSampleOffset : -1; }

    // Header of the slice delivered last, or being delivered, read without a picture parameter set.
    const VideoAvcSliceHeader& GetSliceHeader() const { return sliceHeader; }

    // Bytes that can be held before the buffer grows.
    int GetBufferCapacity() const { return static_cast<int>(buffer.size()); }

    // `listener` is told of every unit in stream order, with its start code and before anything
    // else happens to it, also of those that never become samples. Empty: nobody is told.
    void SetUnitListener(UnitListener listener) { unitListener = std::move(listener); }

    // Where the diagnostic lines of ParseSliceHeader go for every slice; null, the default:
    // nowhere.
    void SetDiagnosticOutput(std::FILE* output) { diagnostics = output; }

    // 3 or 4 where the bytes start with that start code, else 0. Reads a byte only where those
    // before it are zero, so four readable bytes are enough.
    static int GetStartCodeLength(const unsigned char* bytes);

    // Offset of the next start code in `len` bytes, with its length of 3 or 4 in *startCodeLength
    // unless that is null; `len` and 0 without one. At most three zeros count: a longer run belongs
    // to the data before.
    static int FindStartCode(const unsigned char* bytes, int len, int* startCodeLength);

    // nal_unit_type of a NAL unit header byte, and whether it is that of an IDR slice.
    static int GetNaluType(const unsigned char* nal) { return *nal & 31; }
    static bool IsSyncNalu(const unsigned char* nal) { return GetNaluType(nal) == 5; }

    // Read the leading fields of a sequence parameter set NAL unit (header byte first) of any
    // profile; the second gives the picture size as GetWidth and GetHeight do.
    static void ParseSeqParSet(const unsigned char* nal, int size, VideoAvcSeqParSet* set);
    static void ParseSeqParSet(const unsigned char* nal, int size, int* picWidth, int* picHeight);

    // Reads the leading fields of a picture parameter set; `bytes` starts behind the header byte.
    static void ParsePicParSet(const unsigned char* bytes, int size, VideoAvcPicParSet* set);

    // Reads the leading fields of a slice NAL unit (header byte first) that refers to the given
    // parameter sets. Without a picture parameter set it stops before pic_order_cnt_lsb. With
    // `output` it writes what it met, up to the first macroblock type, as lines of text; they are
    // right for slices of a reference picture without emulation prevention in their header and
    // without reordering, weighting and marking commands.
    static void ParseSliceHeader(const unsigned char* nal, int size, const VideoAvcSeqParSet* sps,
                                 const VideoAvcPicParSet* pps, VideoAvcSliceHeader* header,
                                 std::FILE* output = nullptr);
    static void ParseSliceHeader(const unsigned char* nal, int size, const VideoAvcSeqParSet* sps,
                                 VideoAvcSliceHeader* header, std::FILE* output = nullptr);

private:
    bool HoldsParSets() const { return !seqParSetData.empty() && !picParSetData.empty(); }
    unsigned char* Held() { return buffer.data() + dataStart; }
    bool DelimitUnit(int startCodeLength, int* nextStartCodeLength);
    void TakeUnit(int startCodeLength);
    void CaptureParSet(const unsigned char* nal, int size);
    void DeliverSample(unsigned char* unit, int size);

    ISampleConsumer* consumer;       // borrowed, may be null
    MediaStreamConfig streamConfig;  // avc1, described by this object
    UnitListener unitListener;
    std::FILE* diagnostics = nullptr;  // borrowed

    int firstSampleOffset = 0;  // bytes of the stream that became no sample
    int nalType = 0;            // nal_unit_type of the unit delimited last
    MediaSample sample;         // the one sample that is delivered; its data points into `buffer`

    std::vector<unsigned char> buffer;  // pending bytes of the stream
    int dataStart = 0;                  // index in `buffer` of the first held byte, which is the
                                        // start of a unit once a start code has been seen
    int dataSize = 0;                   // bytes held
    int scannedSize = 0;                // held bytes in which no next start code ends
    int nalSize = 0;                    // bytes of the unit delimited last, with its start code

    long long sampleCount = 0;  // samples delivered, the index of the next one's time
    long long sampleTime = 0;   // time of the last delivered sample, microseconds

    int width = 0;       // picture size, luma samples
    int height = 0;      //
    double frameRate;    // frames per second
    double framePeriod;  // seconds, 0 for a rate of 0

    std::vector<unsigned char> seqParSetData;  // first parameter sets, empty until captured
    std::vector<unsigned char> picParSetData;  //
    VideoAvcSeqParSet seqParSet;               // fields of the first sequence parameter set
    VideoAvcSliceHeader sliceHeader;           // fields of the last slice
};
