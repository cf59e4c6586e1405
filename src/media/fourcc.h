#pragma once

namespace zolt {

// The four-character code of `text`: its first character is the most significant byte, so
// fourcc("avc1") is 0x61766331. Media types and colour formats are such codes.
constexpr int fourcc(const char (&text)[5]) {
    unsigned code = 0;
    for (int i = 0; i < 4; ++i) {
        code = code << 8 | static_cast<unsigned char>(text[i]);
    }
    return static_cast<int>(code);
}

}  // namespace zolt
