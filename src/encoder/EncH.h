#pragma once

class CEncoder;

// Owner of one encoder engine; the form in which the session holds it.
class CEncH {
public:
    // Creates the engine for pictures of width x height luma samples (each at least 16).
    CEncH(int width, int height);
    CEncH(const CEncH&) = delete;
    CEncH& operator=(const CEncH&) = delete;
    virtual ~CEncH();

    // The engine; owned by this object.
    CEncoder* get_encoder() const { return encoder; }

private:
    CEncoder* encoder;
};
