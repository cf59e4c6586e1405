#pragma once

namespace zolt {

// The wish of the user or the system that the program ends early.
class StopSignal {
public:
    // From here on the first SIGINT or SIGTERM is noted instead of ending the process; a second one
    // of the same kind ends it at once.
    static void install();

    // Number of the signal that came, 0 while none has.
    static int received();
};

}  // namespace zolt
