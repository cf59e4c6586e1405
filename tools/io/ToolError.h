#pragma once

#include <stdexcept>

namespace zolt {

// A failure that the user has to hear of. The message is one line that names the file or the option
// and says what is wrong and what would be right.
class ToolError : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

// The command line itself is wrong.
class UsageError : public ToolError {
public:
    using ToolError::ToolError;
};

// The input ends too early: before its first picture or within one. What was read before is good.
class TruncatedInput : public ToolError {
public:
    using ToolError::ToolError;
};

}  // namespace zolt
