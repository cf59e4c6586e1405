#pragma once

#include <dirent.h>

// Directory listing: the system's own opendir, readdir, closedir, rewinddir.
