// Control over the work queues for the host and for tests.
#pragma once

#include <cstddef>

enum class VPDelayMode {
    Real,      // dispatch_after waits for its time (default)
    Immediate, // dispatch_after behaves like dispatch_async
    Manual,    // delayed work waits until VPDispatchFireDelayed
};

void VPDispatchSetDelayMode(VPDelayMode mode);
VPDelayMode VPDispatchGetDelayMode();
// Blocks until no queued or running work is left. Delayed work that is not yet
// due (Real) or held (Manual) does not count. Called from a block, it waits for
// all other work (and runs queued blocks itself meanwhile) instead of for itself.
void VPDispatchDrain();
// Delayed work not yet run.
size_t VPDispatchPendingDelayed();
// Makes all held or not-yet-due delayed work due now; returns how many.
size_t VPDispatchFireDelayed();
// Worker threads serving the global queues (blocks that can run at once).
size_t VPDispatchWorkerCount();
