#pragma once

class IMediaEncoder;

// What the shared library exports; the host looks these functions up by name.
extern "C" {

// Media type code of the encoder's output: avc1.
[[gnu::visibility("default")]] int GetEncoderType();
// Display name of the encoder; a constant.
[[gnu::visibility("default")]] const char* GetEncoderName();
// A new encoding session, owned by the caller.
[[gnu::visibility("default")]] IMediaEncoder* GetNewEncoder();
}
