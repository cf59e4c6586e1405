#include <new>

#include "host/HostErrMgr.h"
#include "host/HostLogger.h"
#include "host/SharedObject.h"
#include "host/host.h"

namespace {

// Never destroyed: users that have not given the object back may call it until the process ends.
template <class T>
zolt::SharedObject<T>& shared() {
    using Shared = zolt::SharedObject<T>;
    alignas(Shared) static unsigned char storage[sizeof(Shared)];
    static Shared* const object = new (storage) Shared;
    return *object;
}

}  // namespace

IErrMgr* GetErrMgr() {
    return shared<zolt::HostErrMgr>().get();
}

void DeleteErrMgr() {
    shared<zolt::HostErrMgr>().give_back();
}

ILogger* GetLogger() {
    return shared<zolt::HostLogger>().get();
}

void DeleteLogger() {
    shared<zolt::HostLogger>().give_back();
}
