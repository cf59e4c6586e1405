#include "media/MediaType.h"

#include <cstring>

using zolt::fourcc;

const MediaType::MediaMapRow MediaType::MediaMap[MediaMapSize] = {
    {kUndefined, "Media Type Undefined"},
    {kAudioUncompressed, "Audio Uncompressed"},
    {fourcc("g711"), "Audio G.711"},
    {fourcc("g726"), "Audio G.726"},
    {fourcc(".mp3"), "Audio MP3"},
    {fourcc("mp4a"), "Audio MPEG-4 AAC"},
    {fourcc("wm9a"), "Audio Windows Media 9"},
    {kVideoUncompressed, "Video Uncompressed"},
    {fourcc("h263"), "Video H.263"},
    {fourcc("mpg1"), "Video MPEG-1"},
    {fourcc("mpg2"), "Video MPEG-2"},
    {fourcc("mp4v"), "Video MPEG-4"},
    {kVideoAvc, "Video AVC"},
    {fourcc("jpeg"), "Video JPEG"},
    {fourcc(".png"), "Video PNG"},
    {fourcc("mash"), "Video Mashup"},
    {fourcc("wm9v"), "Video Windows Media 9"},
    {kTextUncompressed, "Text Uncompressed"},
    {fourcc("3gtt"), "3GPP Timed Text"},
    {fourcc("cc  "), "Closed Captioning"},
    {fourcc("cevt"), "Collaboration Event"},
    {fourcc("href"), "HREF"},
};

bool MediaType::IsAudio(long code) {
    switch (code) {
        case kAudioUncompressed:
        case fourcc("g711"):
        case fourcc("g726"):
        case fourcc(".mp3"):
        case fourcc("mp4a"):
        case fourcc("wm9a"):
            return true;
        default:
            return false;
    }
}

bool MediaType::IsVideo(long code) {
    switch (code) {
        case kVideoUncompressed:
        case fourcc("h263"):
        case fourcc("mpg1"):
        case fourcc("mpg2"):
        case fourcc("mp4v"):
        case kVideoAvc:
        case fourcc("jpeg"):
        case fourcc(".png"):
        case fourcc("mash"):
        case fourcc("wm9v"):
            return true;
        default:
            return false;
    }
}

bool MediaType::IsText(long code) {
    switch (code) {
        case kTextUncompressed:
        case fourcc("3gtt"):
        case fourcc("cc  "):
            return true;
        default:
            return false;
    }
}

int MediaType::GetDecMediaType(long code) {
    if (IsAudio(code)) {
        return kAudioUncompressed;
    }
    if (IsVideo(code)) {
        return kVideoUncompressed;
    }
    return IsText(code) ? kTextUncompressed : kUndefined;
}

const char* MediaType::ToString(long code) {
    for (const MediaMapRow& row : MediaMap) {
        if (row.code == code) {
            return row.name;
        }
    }
    return "Unknown Media Type";
}

int MediaType::ToMediaType(const char* name) {
    if (name != nullptr) {
        for (const MediaMapRow& row : MediaMap) {
            if (std::strcmp(row.name, name) == 0) {
                return row.code;
            }
        }
    }
    return kUndefined;
}

const char* MediaType::CapTypeString(long code) {
    switch (code) {
        case fourcc("audi"):
            return "Audio Capture";
        case fourcc("vide"):
            return "Video Capture";
        case fourcc("wind"):
            return "Window/Desktop Capture";
        case kUndefined:
            return "Capture Type Undefined";
        default:
            return "Unknown Capture Type";
    }
}
