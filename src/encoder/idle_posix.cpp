#include <chrono>
#include <thread>

#include "encoder/idle.h"

void zolt::Idle::give_way() {
    std::this_thread::yield();
}

void zolt::Idle::sleep_shortly() {
    std::this_thread::sleep_for(std::chrono::microseconds(50));
}
