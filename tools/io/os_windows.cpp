// windows.h first: the headers after it need its types.
#include <windows.h>
//
#include <fcntl.h>
#include <io.h>
#include <shellapi.h>

#include <cerrno>
#include <cstdlib>
#include <cwchar>
#include <vector>

#include "io/os.h"
#include "support/windows_names.h"

namespace zolt {
namespace {

constexpr DWORD kShared = FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE;

// Sets errno from the system's last error.
void set_errno() {
    switch (GetLastError()) {
        case ERROR_FILE_NOT_FOUND:
        case ERROR_PATH_NOT_FOUND:
        case ERROR_INVALID_NAME:
        case ERROR_BAD_PATHNAME:
        case ERROR_BAD_NETPATH:
        case ERROR_INVALID_DRIVE:
            errno = ENOENT;
            break;
        case ERROR_ACCESS_DENIED:
        case ERROR_SHARING_VIOLATION:
        case ERROR_LOCK_VIOLATION:
        case ERROR_WRITE_PROTECT:
            errno = EACCES;
            break;
        case ERROR_FILE_EXISTS:
        case ERROR_ALREADY_EXISTS:
            errno = EEXIST;
            break;
        case ERROR_BROKEN_PIPE:
        case ERROR_NO_DATA:
        case ERROR_PIPE_NOT_CONNECTED:
            errno = EPIPE;
            break;
        case ERROR_DISK_FULL:
        case ERROR_HANDLE_DISK_FULL:
            errno = ENOSPC;
            break;
        case ERROR_INVALID_HANDLE:
            errno = EBADF;
            break;
        case ERROR_OPERATION_ABORTED:
            errno = EINTR;
            break;
        case ERROR_NO_UNICODE_TRANSLATION:
            errno = EILSEQ;
            break;
        default:
            errno = EIO;
    }
}

HANDLE handle_of(int descriptor) {
    return reinterpret_cast<HANDLE>(_get_osfhandle(descriptor));
}

// INVALID_HANDLE_VALUE on failure.
HANDLE open_handle(const std::string& name, DWORD access, DWORD sharing, DWORD disposition) {
    std::wstring utf16;
    if (!to_utf16(name.c_str(), &utf16)) {
        return INVALID_HANDLE_VALUE;
    }
    // Directories are opened with this flag alone, and only their status is asked for.
    const DWORD flags = access == 0 ? FILE_FLAG_BACKUP_SEMANTICS : FILE_ATTRIBUTE_NORMAL;
    return CreateFileW(utf16.c_str(), access, sharing, nullptr, disposition, flags, nullptr);
}

bool is_directory(const std::string& name) {
    std::wstring utf16;
    if (!to_utf16(name.c_str(), &utf16)) {
        return false;
    }
    const DWORD attributes = GetFileAttributesW(utf16.c_str());
    return attributes != INVALID_FILE_ATTRIBUTES && (attributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
}

int open_descriptor(const std::string& name, DWORD access, DWORD sharing, DWORD disposition) {
    const HANDLE handle = open_handle(name, access, sharing, disposition);
    if (handle == INVALID_HANDLE_VALUE) {
        set_errno();
        if (errno == EACCES && is_directory(name)) {
            errno = EISDIR;
        }
        return -1;
    }
    const int descriptor = _open_osfhandle(reinterpret_cast<intptr_t>(handle), _O_BINARY);
    if (descriptor < 0) {
        CloseHandle(handle);
    }
    return descriptor;
}

std::optional<FileStatus> handle_status(HANDLE handle) {
    if (handle == INVALID_HANDLE_VALUE) {
        return std::nullopt;
    }
    FileStatus status = {};
    BY_HANDLE_FILE_INFORMATION information;
    if (GetFileType(handle) == FILE_TYPE_DISK && GetFileInformationByHandle(handle, &information)) {
        status.is_regular = (information.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) == 0;
        status.volume = information.dwVolumeSerialNumber;
        status.number = std::uint64_t{information.nFileIndexHigh} << 32 | information.nFileIndexLow;
    }
    return status;
}

// Calls get(buffer, size), which returns how long its text is, with a buffer that is long enough.
template <class Get>
std::string text_from(Get get) {
    std::wstring text(MAX_PATH, L'\0');
    while (true) {
        const DWORD length = get(text.data(), static_cast<DWORD>(text.size()));
        if (length == 0) {
            set_errno();
            return "";
        }
        if (length < text.size()) {
            std::string utf8;
            to_utf8(text.c_str(), &utf8);
            return utf8;
        }
        text.resize(2 * text.size());
    }
}

}  // namespace

void os_prepare_streams() {
    for (const int stream : {kStandardInput, kStandardOutput, kStandardError}) {
        if (_setmode(stream, _O_BINARY) == -1 &&
            _wopen(L"NUL", stream == kStandardInput ? _O_WRONLY : _O_RDONLY) != stream) {
            std::exit(EXIT_FAILURE);
        }
    }
    // For what is shown on a console; pipes and files get the bytes.
    SetConsoleOutputCP(CP_UTF8);
}

const char* const* os_command_line(int* argc, const char* const*) {
    static std::vector<std::string> arguments;
    static std::vector<const char*> pointers;
    wchar_t** const utf16 = CommandLineToArgvW(GetCommandLineW(), argc);
    for (int i = 0; utf16 != nullptr && i < *argc; ++i) {
        std::string argument;
        if (!to_utf8(utf16[i], &argument)) {
            // No file's name that can be shown; as an argument it is refused, as a name not found.
            argument = "\xEF\xBF\xBD";
        }
        arguments.push_back(argument);
    }
    LocalFree(utf16);
    *argc = static_cast<int>(arguments.size());
    for (const std::string& argument : arguments) {
        pointers.push_back(argument.c_str());
    }
    pointers.push_back(nullptr);
    return pointers.data();
}

bool os_has_terminal() {
    const HANDLE handle = handle_of(kStandardError);
    DWORD mode = 0;
    return GetConsoleMode(handle, &mode) &&
           SetConsoleMode(handle, mode | ENABLE_VIRTUAL_TERMINAL_PROCESSING);
}

std::optional<FileStatus> os_status(const std::string& name) {
    // To open a pipe is to take it from those who write to it.
    if (name.compare(0, 4, "\\\\.\\") == 0) {
        return FileStatus{};
    }
    const HANDLE handle = open_handle(name, 0, kShared, OPEN_EXISTING);
    const std::optional<FileStatus> status = handle_status(handle);
    if (status) {
        CloseHandle(handle);
    } else {
        set_errno();
    }
    return status;
}

std::optional<FileStatus> os_status(int descriptor) {
    return handle_status(handle_of(descriptor));
}

std::string os_resolved_name(const std::string& name) {
    const HANDLE handle = open_handle(name, 0, kShared, OPEN_EXISTING);
    if (handle != INVALID_HANDLE_VALUE) {
        const std::string resolved = text_from([handle](wchar_t* text, DWORD size) {
            return GetFinalPathNameByHandleW(handle, text, size, FILE_NAME_NORMALIZED);
        });
        CloseHandle(handle);
        if (!resolved.empty()) {
            return resolved;
        }
    }
    std::wstring utf16;
    if (!to_utf16(name.c_str(), &utf16)) {
        set_errno();
        return "";
    }
    return text_from([&utf16](wchar_t* text, DWORD size) {
        return GetFullPathNameW(utf16.c_str(), size, text, nullptr);
    });
}

bool os_is_same_name(const std::string& resolved, const std::string& other) {
    std::wstring texts[2];
    return to_utf16(resolved.c_str(), &texts[0]) && to_utf16(other.c_str(), &texts[1]) &&
           CompareStringOrdinal(texts[0].c_str(), -1, texts[1].c_str(), -1, TRUE) == CSTR_EQUAL;
}

int os_open_input(const std::string& name) {
    return open_descriptor(name, GENERIC_READ, kShared, OPEN_EXISTING);
}

int os_open_output(const std::string& name) {
    return open_descriptor(name, GENERIC_WRITE, kShared, OPEN_EXISTING);
}

int os_create(const std::string& name, const std::optional<FileStatus>&) {
    // A new file has the rights that its directory gives. Sharing its deletion lets os_remove take
    // it away while it is open.
    return open_descriptor(name, GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_DELETE, CREATE_NEW);
}

int os_duplicate_output() {
    HANDLE handle = nullptr;
    const HANDLE process = GetCurrentProcess();
    if (!DuplicateHandle(process, handle_of(kStandardOutput), process, &handle, 0, FALSE,
                         DUPLICATE_SAME_ACCESS)) {
        set_errno();
        return -1;
    }
    const int descriptor = _open_osfhandle(reinterpret_cast<intptr_t>(handle), _O_BINARY);
    if (descriptor < 0) {
        CloseHandle(handle);
    }
    return descriptor;
}

bool os_may_write(const std::string& name) {
    const int descriptor = os_open_output(name);
    if (descriptor >= 0) {
        _close(descriptor);
    }
    return descriptor >= 0;
}

bool os_close(int descriptor) {
    return _close(descriptor) == 0;
}

std::ptrdiff_t os_read(int descriptor, void* data, std::size_t size) {
    DWORD count = 0;
    if (!ReadFile(handle_of(descriptor), data, static_cast<DWORD>(size), &count, nullptr)) {
        set_errno();
        // All who could write to a pipe have closed it: its end.
        return errno == EPIPE ? 0 : -1;
    }
    return static_cast<std::ptrdiff_t>(count);
}

std::ptrdiff_t os_write(int descriptor, const void* data, std::size_t size) {
    DWORD count = 0;
    if (!WriteFile(handle_of(descriptor), data, static_cast<DWORD>(size), &count, nullptr)) {
        set_errno();
        return -1;
    }
    return static_cast<std::ptrdiff_t>(count);
}

bool os_seek(int descriptor, std::int64_t position) {
    LARGE_INTEGER target;
    target.QuadPart = position;
    if (!SetFilePointerEx(handle_of(descriptor), target, nullptr, FILE_BEGIN)) {
        set_errno();
        return false;
    }
    return true;
}

void os_sleep(std::int64_t microseconds) {
    Sleep(static_cast<DWORD>((microseconds + 999) / 1000));
}

int os_stream_error() {
    // The C library makes an invalid argument of a pipe that is being closed.
    return _doserrno == ERROR_NO_DATA || _doserrno == ERROR_PIPE_NOT_CONNECTED ? EPIPE : errno;
}

std::optional<std::int64_t> os_bytes_left(int descriptor) {
    const HANDLE handle = handle_of(descriptor);
    LARGE_INTEGER size;
    LARGE_INTEGER position;
    if (GetFileType(handle) != FILE_TYPE_DISK || !GetFileSizeEx(handle, &size) ||
        !SetFilePointerEx(handle, {}, &position, FILE_CURRENT)) {
        return std::nullopt;
    }
    return size.QuadPart - position.QuadPart;
}

bool os_replace(const std::string& from, const std::string& to) {
    std::wstring names[2];
    if (!to_utf16(from.c_str(), &names[0]) || !to_utf16(to.c_str(), &names[1]) ||
        !MoveFileExW(names[0].c_str(), names[1].c_str(), MOVEFILE_REPLACE_EXISTING)) {
        set_errno();
        return false;
    }
    return true;
}

void os_remove(const std::string& name) {
    std::wstring utf16;
    if (to_utf16(name.c_str(), &utf16)) {
        DeleteFileW(utf16.c_str());
    }
}

std::string os_program_directory() {
    const std::string program = text_from(
        [](wchar_t* text, DWORD size) { return GetModuleFileNameW(nullptr, text, size); });
    return program.substr(0, program.rfind('\\') + 1);
}

void* os_loaded_library(const std::string& name) {
    std::wstring utf16;
    HMODULE module = nullptr;
    if (to_utf16(name.c_str(), &utf16)) {
        GetModuleHandleExW(0, utf16.c_str(), &module);
    }
    return module;
}

void os_divert_output(bool to_standard_error) {
    if (to_standard_error) {
        _dup2(kStandardError, kStandardOutput);
        return;
    }
    const int nowhere = _wopen(L"NUL", _O_WRONLY | _O_BINARY);
    if (nowhere >= 0) {
        _dup2(nowhere, kStandardOutput);
        _close(nowhere);
    }
}

}  // namespace zolt
