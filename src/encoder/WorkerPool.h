#pragma once

class Wavefront;

// Threads that are lent to the engine, which starts none itself.
class WorkerPool {
public:
    // How many workers may be of use, asked once a picture; below 1 counts as 1.
    virtual int threads() noexcept = 0;
    // Calls work.run_worker(n) once for each n of 0..workers-1, on any threads, at once or one
    // after another, in any order, and returns when all have returned.
    virtual void run(Wavefront& work, int workers) noexcept = 0;

protected:
    ~WorkerPool() = default;
};
