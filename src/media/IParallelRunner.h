#pragma once

// Work that may be done by several workers at once. Made by the encoder, called by the host.
class IParallelTask {
public:
    // Does one worker's share; returns when there is no more for it. Each worker is called once.
    virtual void Run(int worker) noexcept = 0;

protected:
    ~IParallelTask() = default;
};

// Threads that the host lends to an encoder, which starts none itself: implemented by the host.
class IParallelRunner {
public:
    // How many workers may be of use, asked once a picture; below 1 counts as 1.
    virtual int GetThreads() noexcept = 0;
    // Calls task->Run(worker) exactly once for each worker 0..workers-1, on any threads, at once or
    // one after another, in any order, and returns when all calls have returned. The task is valid
    // until then.
    virtual void Run(IParallelTask* task, int workers) noexcept = 0;

protected:
    ~IParallelRunner() = default;
};
