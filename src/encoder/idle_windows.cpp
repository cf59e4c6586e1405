#include <windows.h>

#include "encoder/idle.h"

void zolt::Idle::give_way() {
    SwitchToThread();
}

void zolt::Idle::sleep_shortly() {
    Sleep(1);
}
