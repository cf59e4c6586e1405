#pragma once

#include <sys/types.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <deque>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace zolt_test {

// The decoder of the ffmpeg program as a child process. It is fed with NAL units and its pictures
// are compared with the expected ones as they come, so that a stream of any length can be checked.
class Decoder {
public:
    // width, height: samples of the decoded pictures. Throws std::runtime_error when the program
    // cannot be started.
    Decoder(int width, int height);
    Decoder(const Decoder&) = delete;
    Decoder& operator=(const Decoder&) = delete;
    ~Decoder();

    void send_parameter_set(const std::uint8_t* nal, int size);
    // Sends the NAL unit of a picture that has to decode to `expected`, planar 4:2:0.
    void send_picture(const std::uint8_t* nal, int size, std::vector<std::uint8_t> expected);

    // Ends the stream. Returns what is wrong: the first picture that differs, pictures missing or
    // too many, anything the decoder has reported; empty when all is well.
    std::string finish();

private:
    void compare_pictures();
    static std::string difference(const std::vector<std::uint8_t>& expected,
                                  const std::vector<std::uint8_t>& decoded, long picture);

    std::size_t picture_size_;
    pid_t process_ = 0;
    int input_ = -1;
    std::FILE* output_ = nullptr;
    std::FILE* errors_ = nullptr;  // what the program writes to standard error
    std::thread reader_;
    // Shared with the reader.
    std::mutex mutex_;
    std::deque<std::vector<std::uint8_t>> expected_;
    std::string problem_;
};

}  // namespace zolt_test
