#include "common/Decoder.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <stdexcept>
#include <utility>

extern char** environ;

namespace zolt_test {
namespace {

const std::uint8_t kStartCode[] = {0, 0, 0, 1};

// Returns false when nobody reads any more.
bool write_all(int file, const std::uint8_t* data, std::size_t size) {
    while (size > 0) {
        const ssize_t written = write(file, data, size);
        if (written < 0) {
            return false;
        }
        data += written;
        size -= static_cast<std::size_t>(written);
    }
    return true;
}

}  // namespace

Decoder::Decoder(int width, int height)
    : picture_size_(static_cast<std::size_t>(width) * static_cast<std::size_t>(height) * 3 / 2) {
    std::signal(SIGPIPE, SIG_IGN);
    // Closed on exec, so that programs started at the same time do not keep each other's pipes
    // open.
    int in[2], out[2];
    errors_ = std::tmpfile();
    if (!errors_ || pipe2(in, O_CLOEXEC) != 0 || pipe2(out, O_CLOEXEC) != 0) {
        throw std::runtime_error("Cannot make the decoder's pipes");
    }
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, in[0], 0);
    posix_spawn_file_actions_adddup2(&actions, out[1], 1);
    posix_spawn_file_actions_adddup2(&actions, fileno(errors_), 2);
    // The probe size lets the demuxer see enough pictures of any stream here to estimate a frame
    // rate, about which it would warn otherwise.
    const char* arguments[] = {"ffmpeg",   "-v",         "warning",   "-nostdin",    "-threads",
                               "1",        "-probesize", "100000000", "-f",          "h264",
                               "-i",       "pipe:0",     "-fps_mode", "passthrough", "-f",
                               "rawvideo", "-pix_fmt",   "yuv420p",   "pipe:1",      nullptr};
    const int error = posix_spawnp(&process_, arguments[0], &actions, nullptr,
                                   const_cast<char**>(arguments), environ);
    posix_spawn_file_actions_destroy(&actions);
    close(in[0]);
    close(out[1]);
    input_ = in[1];
    output_ = fdopen(out[0], "r");
    if (error != 0) {
        throw std::runtime_error("Cannot start ffmpeg");
    }
    reader_ = std::thread(&Decoder::compare_pictures, this);
}

Decoder::~Decoder() {
    if (reader_.joinable()) {
        finish();
    }
}

void Decoder::send_parameter_set(const std::uint8_t* nal, int size) {
    // A decoder that is gone shows in finish().
    write_all(input_, kStartCode, sizeof kStartCode) &&
        write_all(input_, nal, static_cast<std::size_t>(size));
}

void Decoder::send_picture(const std::uint8_t* nal, int size, std::vector<std::uint8_t> expected) {
    {
        const std::lock_guard<std::mutex> lock(mutex_);
        expected_.push_back(std::move(expected));
    }
    send_parameter_set(nal, size);
}

std::string Decoder::finish() {
    close(input_);
    reader_.join();
    std::fclose(output_);
    int status = 0;
    waitpid(process_, &status, 0);
    if (problem_.empty() && !expected_.empty()) {
        problem_ = std::to_string(expected_.size()) + " pictures have not been decoded";
    }
    if (status != 0) {
        problem_ += "; the decoder ended with status " + std::to_string(status);
    }
    std::rewind(errors_);
    char line[300];
    while (std::fgets(line, sizeof line, errors_)) {
        problem_ += std::string("; ") + line;
    }
    std::fclose(errors_);
    return problem_;
}

// The reader: compares until the decoder's output ends.
void Decoder::compare_pictures() {
    std::vector<std::uint8_t> decoded(picture_size_);
    for (long picture = 0;; ++picture) {
        const std::size_t size = std::fread(decoded.data(), 1, picture_size_, output_);
        if (size == 0) {
            return;
        }
        const std::lock_guard<std::mutex> lock(mutex_);
        std::string problem;
        if (size != picture_size_) {
            problem = "part of a picture has been decoded";
        } else if (expected_.empty()) {
            problem = "more pictures have been decoded than sent";
        } else {
            problem = difference(expected_.front(), decoded, picture);
            expected_.pop_front();
        }
        if (problem_.empty()) {
            problem_ = problem;
        }
    }
}

// Says where the pictures differ first; empty when they do not.
std::string Decoder::difference(const std::vector<std::uint8_t>& expected,
                                const std::vector<std::uint8_t>& decoded, long picture) {
    const auto at = std::mismatch(expected.begin(), expected.end(), decoded.begin());
    if (at.first == expected.end()) {
        return "";
    }
    return "picture " + std::to_string(picture) + ": sample " +
           std::to_string(at.first - expected.begin()) + " is " + std::to_string(*at.second) +
           ", reconstructed as " + std::to_string(*at.first);
}

}  // namespace zolt_test
