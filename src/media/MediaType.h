#pragma once

#include "media/fourcc.h"

// The media types of the host: four-character codes, their names and their kinds.
class MediaType {
public:
    static constexpr int kUndefined = zolt::fourcc("####");
    static constexpr int kAudioUncompressed = zolt::fourcc("unca");
    static constexpr int kVideoUncompressed = zolt::fourcc("uncv");
    static constexpr int kVideoAvc = zolt::fourcc("avc1");
    static constexpr int kTextUncompressed = zolt::fourcc("text");

    struct MediaMapRow {
        int code;
        const char* name;
    };
    static constexpr int MediaMapSize = 22;
    static const MediaMapRow MediaMap[MediaMapSize];

    static bool IsAudio(long code);
    static bool IsVideo(long code);
    static bool IsText(long code);

    // The type that a decoder of `code` produces; kUndefined for what is not audio, video or text.
    static int GetDecMediaType(long code);

    // The name of a media type; "Unknown Media Type" for a code outside the table.
    static const char* ToString(long code);
    // The media type of a name, compared byte for byte; kUndefined for null and unknown names.
    static int ToMediaType(const char* name);
    // The name of a capture type; "Unknown Capture Type" for any other code.
    static const char* CapTypeString(long code);
};
