#pragma once

// Finds the host's shared libraries in one directory and loads those that export a given set of
// functions. Progress goes to standard output in lines that start with "LOAD_DLLS>". Not guarded:
// callers serialise.
class DllUtils {
public:
    // The environment variable that names the library directory, and the directory without it.
    static const char* const EnvVarStreamingEngineLib;
    static const char* const DefaultStreamingEngineLib;

    // Sets the library directory (cut to 287 characters), and the environment variable for
    // components loaded later. Null does nothing.
    static void SetDllDir(const char* dir);

    // The library directory: the last one set, else that of the environment variable (unset and
    // empty are the same), else ".".
    static const char* GetDllDir();

    // Writes the full path of an existing, readable library into `out` and returns 0, or returns 1
    // with `out` empty. `name` gets the system's extension where it has none; the library's file is
    // called name, libname or libdll_name, the first that exists. `out` has room for the directory,
    // the name and 12 more characters.
    static int ConstructDllFullPathName(char* out, const char* name);

    // Loads one library and resolves `n` functions into funcPtrs. Returns its handle, which
    // UnloadDll releases; null, with nothing loaded and all of funcPtrs null, when the library or
    // one of the functions is not there.
    static void* LoadDll(const char* path, int n, const char* const* funcNames, void** funcPtrs);

    // Loads libraries of `dir` (GetDllDir() without one) that export all `n` functions, in the
    // order in which the directory lists them, up to `maxDlls`; returns how many. dllHandles[i] and
    // funcPtrs[i * n ..] belong to library i; dllNames[i] (dllNames may be null) is a new string of
    // its file name without the extension. A directory that cannot be opened is reported to ErrMgr.
    static int LoadAllDlls(const char* dir, int n, const char* const* funcNames, int maxDlls,
                           char** dllNames, void** dllHandles, void** funcPtrs);
    static int LoadAllDlls(int n, const char* const* funcNames, int maxDlls, char** dllNames,
                           void** dllHandles, void** funcPtrs);

    // The first such library of GetDllDir(): 0, or 1 when there is none. dllName may be null.
    static int LoadFirstDll(int n, const char* const* funcNames, char** dllName, void** dllHandle,
                            void** funcPtrs);

    // Releases *name and unloads *handle where they are set, and sets both to null; `name` may be
    // null.
    static void UnloadDll(char** name, void** handle);

    // The same for *count libraries; sets *count to 0. `names` may be null.
    static void UnloadAllDlls(int* count, char** names, void** handles);

private:
    // Empty until it is first needed.
    static char dllDirectory[288];
};
