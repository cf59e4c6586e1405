#pragma once

namespace zolt {

// A number of the calling thread, from 1. No two threads of a process have the same one, not even
// one after the other.
long current_thread_id();

}  // namespace zolt
