// A shared library that is no encoder.
extern "C" [[gnu::visibility("default")]] int GetEncoderName_() {
    return 0;
}
