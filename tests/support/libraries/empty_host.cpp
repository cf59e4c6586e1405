// A host whose factories have nothing to give and leave an error code behind. It would be a fault
// to give that back.
#include <cerrno>
#include <cstdlib>

class IErrMgr;
class ILogger;

extern "C" {
[[gnu::visibility("default")]] IErrMgr* GetErrMgr() {
    errno = EIO;
    return nullptr;
}
[[gnu::visibility("default")]] void DeleteErrMgr() {
    std::abort();
}
[[gnu::visibility("default")]] ILogger* GetLogger() {
    errno = EIO;
    return nullptr;
}
[[gnu::visibility("default")]] void DeleteLogger() {
    std::abort();
}
}
