// A host whose factories have nothing to give. It would be a fault to give that back.
#include <cstdlib>

class IErrMgr;
class ILogger;

extern "C" {
[[gnu::visibility("default")]] IErrMgr* GetErrMgr() {
    return nullptr;
}
[[gnu::visibility("default")]] void DeleteErrMgr() {
    std::abort();
}
[[gnu::visibility("default")]] ILogger* GetLogger() {
    return nullptr;
}
[[gnu::visibility("default")]] void DeleteLogger() {
    std::abort();
}
}
