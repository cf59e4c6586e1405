// The host's error manager and logger as a library in the Microsoft C++ ABI. Its two tables are
// written down here once more, by their numbers, and share no header with the library that calls
// through them.
//
// No two operations of a class have one name, as that compiler would put them side by side: the
// numbers of the slots are what holds, whatever the names in the host's own sources.

#include "system.h"

namespace {

char reports[8192];
Size length = 0;

void write(const char* text) {
    for (const char* c = text == nullptr ? "(null)" : text; *c != '\0'; ++c) {
        if (length + 1 < sizeof reports) {
            reports[length++] = *c;
        }
    }
}

template <class... Texts>
void report(const char* kind, Texts... texts) {
    write(kind);
    ((write("|"), write(texts)), ...);
    write("\n");
}

class ErrMgr {
public:
    virtual void Slot0(void*) { report("err slot 0"); }
    virtual void Slot1(int, int, const char*, const char*, const char*, const char*) {
        report("err slot 1");
    }
    virtual void Slot2(const char*, const char*, const char*, const char*, const char*) {
        report("err slot 2");
    }
    virtual void Slot3(const char* cls, const char* method, const char* message,
                       const char* extra) {
        report("err", cls, method, message, extra);
    }
    virtual void* Slot4() { return report("err slot 4"), nullptr; }
    virtual void* Slot5() { return report("err slot 5"), nullptr; }
    virtual int Slot6(void***) { return report("err slot 6"), 0; }
    virtual char* Slot7() { return report("err slot 7"), nullptr; }
    virtual void Slot8() { report("err slot 8"); }
    virtual int Slot9(long**) { return report("err slot 9"), 0; }
    virtual void* Slot10(long) { return report("err slot 10"), nullptr; }
    virtual int Slot11(long, void***) { return report("err slot 11"), 0; }
    virtual char* Slot12(long) { return report("err slot 12"), nullptr; }
    virtual void Slot13(long) { report("err slot 13"); }
};

class Logger {
public:
    virtual bool Slot0(void (*)(char*)) { return report("log slot 0"), true; }
    virtual bool Slot1(const char*) { return report("log slot 1"), true; }
    virtual bool Slot2() { return report("log slot 2"), true; }
    virtual void Slot3() { report("log slot 3"); }
    virtual void Slot4(bool) { report("log slot 4"); }
    virtual void Slot5(bool) { report("log slot 5"); }
    virtual void Slot6(bool) { report("log slot 6"); }
    virtual void Slot7(int, const char*, const char*, const char*) { report("log slot 7"); }
    virtual void Slot8(int, int, const char*, const char*, const char*) { report("log slot 8"); }
    virtual void Slot9(const char* cls, const char* method, const char* message) {
        report("log", cls, method, message);
    }
    virtual void Slot10(int, int) { report("log slot 10"); }
    virtual void Slot11(int, int) { report("log slot 11"); }
    virtual bool Slot12(int, int) { return report("log slot 12"), false; }
};

ErrMgr err_mgr;
Logger logger;

}  // namespace

extern "C" {

__declspec(dllexport) void* GetErrMgr() {
    return &err_mgr;
}

__declspec(dllexport) void DeleteErrMgr() {}

__declspec(dllexport) void* GetLogger() {
    return &logger;
}

__declspec(dllexport) void DeleteLogger() {}

// What has been reported since the last call.
__declspec(dllexport) const char* TakeReports() {
    reports[length] = '\0';
    length = 0;
    return reports;
}

}  // extern "C"
