#pragma once

#include "encoder/Wavefront.h"
#include "encoder/WorkerPool.h"
#include "media/IParallelRunner.h"

// A host's runner as the engine's pool of workers.
class LentThreads : public WorkerPool, private IParallelTask {
public:
    // The runner of the pictures to come, borrowed; not null while the engine uses this pool.
    void set_runner(IParallelRunner* lent) { runner = lent; }

    int threads() noexcept override { return runner->GetThreads(); }
    void run(Wavefront& work, int workers) noexcept override {
        rows = &work;
        runner->Run(this, workers);
    }

private:
    void Run(int worker) noexcept override { rows->run_worker(worker); }

    IParallelRunner* runner = nullptr;
    Wavefront* rows = nullptr;
};
