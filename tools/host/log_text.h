#pragma once

#include <string>

// The pieces of which the host's error and log lines are made.
namespace zolt {

// "Class::Method: ", without the parts that are null.
std::string origin_text(const char* cls, const char* method);

// "[domain code]", the domain as its four characters where these can be printed.
std::string code_text(int domain, int code);

}  // namespace zolt
