#pragma once

namespace zolt {

// Passes the time of a thread that waits for another one, which it looks at between calls: the
// first calls last less than a microsecond each, later ones give the processor away, and when much
// time has passed they sleep.
class Idle {
public:
    void wait();

private:
    static void give_way();
    static void sleep_shortly();

    int m_calls = 0;
};

}  // namespace zolt
