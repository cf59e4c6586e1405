#include "host/HostErrMgr.h"
#include "host/HostLogger.h"
#include "host/SharedObject.h"
#include "host/host.h"

namespace {

zolt::SharedObject<zolt::HostErrMgr> err_mgr;
zolt::SharedObject<zolt::HostLogger> logger;

}  // namespace

IErrMgr* GetErrMgr() {
    return err_mgr.get();
}

void DeleteErrMgr() {
    err_mgr.give_back();
}

ILogger* GetLogger() {
    return logger.get();
}

void DeleteLogger() {
    logger.give_back();
}
