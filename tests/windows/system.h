#pragma once

// The few functions of the system that the foreign host and its services use, and what a compiler
// expects of a C++ runtime: both are built without any library but kernel32.dll.

using Size = decltype(sizeof 0);
using Handle = void*;

struct MemoryCounters {
    unsigned long bytes;
    unsigned long page_faults;
    Size peak_working_set, working_set;
    Size peak_paged_pool, paged_pool, peak_nonpaged_pool, nonpaged_pool;
    Size committed, peak_committed;
};

extern "C" {
__declspec(dllimport) Handle __stdcall LoadLibraryA(const char* name);
__declspec(dllimport) Handle __stdcall GetModuleHandleA(const char* name);
__declspec(dllimport) void* __stdcall GetProcAddress(Handle library, const char* name);
__declspec(dllimport) int __stdcall FreeLibrary(Handle library);
__declspec(dllimport) Handle __stdcall GetStdHandle(unsigned long which);
__declspec(dllimport) Handle
    __stdcall CreateFileA(const char* name, unsigned long access, unsigned long share,
                          void* security, unsigned long disposition, unsigned long attributes,
                          Handle model);
__declspec(dllimport) int __stdcall WriteFile(Handle file, const void* data, unsigned long bytes,
                                              unsigned long* written, void* overlapped);
__declspec(dllimport) int __stdcall CloseHandle(Handle handle);
__declspec(dllimport) Handle __stdcall GetCurrentProcess();
__declspec(dllimport) int __stdcall K32GetProcessMemoryInfo(Handle process,
                                                            MemoryCounters* counters,
                                                            unsigned long bytes);
[[noreturn]] __declspec(dllimport) void __stdcall ExitProcess(unsigned status);

void* memcpy(void* to, const void* from, Size bytes);
void* memset(void* to, int value, Size bytes);
}
