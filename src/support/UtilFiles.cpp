#include <cstdint>
#include <cstring>
#include <limits>
#include <memory>
#include <string>

#include "support/ErrnoKeeper.h"
#include "support/Util.h"
#include "support/os.h"

namespace {

using File = std::unique_ptr<std::FILE, int (*)(std::FILE*)>;

bool is_separator(char c) {
    return c == '/' || c == '\\';
}

bool is_letter(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

bool may_stand_in_path(char c) {
    return c >= ' ' && c <= '~' && std::strchr("\"*:<>?|", c) == nullptr;
}

// Appends `in` to `path`, which ends where a name may start: leading separators are dropped, other
// runs of separators become one '\\'. False when a character may not stand in a path.
bool append_relative_path(std::string* path, const char* in) {
    bool at_name_start = true;
    for (; *in != '\0'; in++) {
        if (is_separator(*in)) {
            if (!at_name_start) {
                *path += '\\';
            }
            at_name_start = true;
        } else if (may_stand_in_path(*in)) {
            *path += *in;
            at_name_start = false;
        } else {
            return false;
        }
    }
    return true;
}

int deliver_path(bool valid, const std::string& path, char* out, int outLen) {
    if (outLen < 1) {
        return 1;
    }
    if (!valid || path.size() >= static_cast<size_t>(outLen)) {
        out[0] = '\0';
        return 1;
    }
    std::memcpy(out, path.c_str(), path.size() + 1);
    return 0;
}

// Reads to the end instead of asking for the size first, so that pipes and files that grow are read
// whole.
bool read_file(const char* path, std::string* contents) {
    const File file(zolt::os_open_file(path, "rb"), std::fclose);
    if (!file) {
        return false;
    }
    char block[1 << 14];
    size_t got = 0;
    while ((got = std::fread(block, 1, sizeof block, file.get())) > 0) {
        contents->append(block, got);
    }
    return std::ferror(file.get()) == 0;
}

}  // namespace

bool Util::IsAbsoluteFileName(const char* name) {
    return is_separator(name[0]) || (is_letter(name[0]) && name[1] == ':');
}

int Util::FormatRelPathName(const char* in, char* out, int outLen) {
    std::string path;
    const bool valid = in != nullptr && append_relative_path(&path, in);
    return deliver_path(valid, path, out, outLen);
}

int Util::FormatAbsPathName(const char* in, char* out, int outLen) {
    std::string path;
    bool valid = false;
    if (in != nullptr) {
        if (is_letter(in[0]) && in[1] == ':') {
            path.assign(in, 2);
            in += 2;
        }
        if (is_separator(*in)) {
            path += '\\';
            valid = append_relative_path(&path, in);
        }
    }
    return deliver_path(valid, path, out, outLen);
}

char* Util::FindFileName(char* path) {
    return path + (FindFileName(const_cast<const char*>(path)) - path);
}

const char* Util::FindFileName(const char* path) {
    const char* name = path;
    for (; *path != '\0'; path++) {
        if (is_separator(*path)) {
            name = path + 1;
        }
    }
    return name;
}

const char* Util::FindExtension(const char* path) {
    const char* dot = std::strrchr(FindFileName(path), '.');
    return dot == nullptr ? nullptr : dot + 1;
}

int Util::GetFileVersionNumber(const char* name) {
    return StringToUnsInt(FindExtension(name));
}

int Util::GetFileVersionNumber(const char* name, char* base, char* ext) {
    const int version = GetFileNameWithoutVersionNumber(name, base);
    const char* extension = FindExtension(base);
    std::strcpy(ext, extension == nullptr ? "" : extension);
    return version;
}

int Util::GetFileNameWithoutVersionNumber(const char* name, char* out) {
    const int version = GetFileVersionNumber(name);
    const size_t length =
        version < 0 ? std::strlen(name) : static_cast<size_t>(FindExtension(name) - 1 - name);
    std::memmove(out, name, length);
    out[length] = '\0';
    return version;
}

std::FILE* Util::Win32FileOpen(const char* path, const char* mode) {
    return zolt::os_open_file(path, mode);
}

char* Util::ReadFileIntoNewString(const char* path) {
    const zolt::ErrnoKeeper keep_errno;
    std::string contents;
    if (!read_file(path, &contents)) {
        return nullptr;
    }
    char* text = new char[contents.size() + 1];
    std::memcpy(text, contents.c_str(), contents.size() + 1);
    return text;
}

int Util::ReadFileIntoNewByteArray(const char* path, unsigned char** buf, long* size) {
    const zolt::ErrnoKeeper keep_errno;
    *buf = nullptr;
    *size = 0;
    std::string contents;
    // A long has 32 bits on Windows.
    if (!read_file(path, &contents) ||
        contents.size() > static_cast<size_t>(std::numeric_limits<long>::max())) {
        return 1;
    }
    *buf = new unsigned char[contents.size()];
    std::memcpy(*buf, contents.data(), contents.size());
    *size = static_cast<long>(contents.size());
    return 0;
}

int Util::WriteByteArrayToFile(const char* path, const unsigned char* buf, long n) {
    const zolt::ErrnoKeeper keep_errno;
    if (n < 0) {
        return 1;
    }
    std::FILE* file = zolt::os_open_file(path, "wb");
    if (file == nullptr) {
        return 1;
    }
    const auto count = static_cast<size_t>(n);
    const bool written = count == 0 || std::fwrite(buf, 1, count, file) == count;
    // Buffered bytes meet a full disk only here.
    const bool closed = std::fclose(file) == 0;
    return written && closed ? 0 : 1;
}

long long Util::GetFileSize(const char* path) {
    const zolt::ErrnoKeeper keep_errno;
    return zolt::os_file_size(path);
}

bool Util::IsDir(const char* path) {
    const zolt::ErrnoKeeper keep_errno;
    return zolt::os_is_directory(path);
}
