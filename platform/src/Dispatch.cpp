// Global concurrent queues served by a small pool of worker threads, plus the
// delayed work of dispatch_after.
//
// Workers take the oldest block of the highest non-empty priority; several
// blocks run at once. Delayed work waits in a list: a timer thread moves it to
// its queue when due (Real), or it waits for VPDispatchFireDelayed (Manual).
// Work delayed in Manual mode stays held until fired, even if the mode changes.
//
// Exit: the pool state is never destroyed, so a block still running while the
// process exits can always reach it. The workers and the timer are stopped and
// joined at exit, before any static object that existed when the pool started
// is destroyed. A running block is finished; blocks still queued or delayed,
// and blocks queued from then on, never run and are never destroyed (their
// captures may point at objects that are already gone).
#include <dispatch/dispatch.h>

#include <VantishPlatform/DispatchControl.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <deque>
#include <limits>
#include <mutex>
#include <thread>
#include <vector>

struct dispatch_queue_s {
    size_t rank; // 0 = highest priority
};

namespace {

constexpr size_t kWorkerCount = 4;
constexpr size_t kPriorityCount = 4;

dispatch_queue_s globalQueues[kPriorityCount] = {{0}, {1}, {2}, {3}};

struct DelayedBlock {
    dispatch_time_t due;
    uint64_t order; // submission order, breaks ties between equal due times
    bool held;      // submitted in Manual mode: runs only when fired
    dispatch_queue_t queue;
    dispatch_block_t block;
};

uint64_t nowNanoseconds()
{
    auto since = std::chrono::steady_clock::now().time_since_epoch();
    return uint64_t(std::chrono::duration_cast<std::chrono::nanoseconds>(since).count());
}

// Set on worker threads: Drain called from a block cannot wait for itself.
thread_local bool onPoolThread = false;

class Pool {
public:
    void enqueue(dispatch_queue_t queue, dispatch_block_t block)
    {
        std::lock_guard lock(mutex_);
        enqueueLocked(queue, std::move(block));
    }

    void enqueueDelayed(dispatch_time_t due, dispatch_queue_t queue, dispatch_block_t block, bool held)
    {
        std::lock_guard lock(mutex_);
        delayed_.push_back({due, nextOrder_++, held, queue, std::move(block)});
        if (!held && !stopping_) {
            startTimerLocked();
            timerWake_.notify_one();
        }
    }

    void drain()
    {
        std::unique_lock lock(mutex_);
        if (!onPoolThread) {
            idle_.wait(lock, [&] { return (queued_ == 0 || stopping_) && running_ == 0; });
            return;
        }
        // Called from a block: that block (and any other block draining) is
        // still running, so wait for every other one, and help run the queue
        // so that draining blocks cannot starve it.
        ++draining_;
        idle_.notify_all();
        for (;;) {
            if (queued_ > 0 && !stopping_) {
                runOneLocked(lock);
                continue;
            }
            if (running_ == draining_)
                break;
            idle_.wait(lock);
        }
        --draining_;
    }

    size_t pendingDelayed()
    {
        std::lock_guard lock(mutex_);
        return delayed_.size();
    }

    size_t fireDelayed()
    {
        std::lock_guard lock(mutex_);
        std::sort(delayed_.begin(), delayed_.end(), [](const DelayedBlock& a, const DelayedBlock& b) {
            return a.due != b.due ? a.due < b.due : a.order < b.order;
        });
        size_t fired = delayed_.size();
        for (auto& d : delayed_)
            enqueueLocked(d.queue, std::move(d.block));
        delayed_.clear();
        return fired;
    }

    // Runs once, at process exit.
    void stop()
    {
        std::vector<std::thread> threads;
        {
            std::lock_guard lock(mutex_);
            stopping_ = true;
            threads.swap(threads_);
        }
        workAvailable_.notify_all();
        timerWake_.notify_all();
        idle_.notify_all();
        for (auto& t : threads) {
            // exit() called from a block: that worker cannot join itself.
            if (t.get_id() == std::this_thread::get_id())
                t.detach();
            else
                t.join();
        }
    }

private:
    void enqueueLocked(dispatch_queue_t queue, dispatch_block_t block)
    {
        queues_[queue->rank].push_back(std::move(block));
        ++queued_;
        if (stopping_)
            return;
        startWorkersLocked();
        workAvailable_.notify_one();
    }

    dispatch_block_t popLocked()
    {
        for (auto& q : queues_) {
            if (!q.empty()) {
                dispatch_block_t block = std::move(q.front());
                q.pop_front();
                --queued_;
                return block;
            }
        }
        return {};
    }

    // Takes the next block and runs it with the lock released. The block is
    // destroyed before the lock is taken again: its captures may queue work.
    void runOneLocked(std::unique_lock<std::mutex>& lock)
    {
        dispatch_block_t block = popLocked();
        ++running_;
        lock.unlock();
        block();
        block = nullptr;
        lock.lock();
        --running_;
        idle_.notify_all();
    }

    void workerLoop()
    {
        onPoolThread = true;
        std::unique_lock lock(mutex_);
        for (;;) {
            workAvailable_.wait(lock, [&] { return stopping_ || queued_ > 0; });
            if (stopping_)
                return;
            runOneLocked(lock);
        }
    }

    void timerLoop()
    {
        std::unique_lock lock(mutex_);
        while (!stopping_) {
            releaseDueLocked(nowNanoseconds());
            auto next = nextDueLocked();
            if (next > uint64_t(std::numeric_limits<int64_t>::max())) { // never, as far as a clock goes
                timerWake_.wait(lock);
            } else {
                auto deadline = std::chrono::steady_clock::time_point(std::chrono::nanoseconds(next));
                timerWake_.wait_until(lock, deadline);
            }
        }
    }

    void releaseDueLocked(dispatch_time_t now)
    {
        // Earliest first, so that blocks due together keep their order.
        std::vector<DelayedBlock> due;
        auto isDue = [&](const DelayedBlock& d) { return !d.held && d.due <= now; };
        for (auto& d : delayed_)
            if (isDue(d))
                due.push_back(std::move(d));
        std::erase_if(delayed_, isDue);
        std::sort(due.begin(), due.end(), [](const DelayedBlock& a, const DelayedBlock& b) {
            return a.due != b.due ? a.due < b.due : a.order < b.order;
        });
        for (auto& d : due)
            enqueueLocked(d.queue, std::move(d.block));
    }

    dispatch_time_t nextDueLocked() const
    {
        dispatch_time_t next = DISPATCH_TIME_FOREVER;
        for (const auto& d : delayed_)
            if (!d.held)
                next = std::min(next, d.due);
        return next;
    }

    void startWorkersLocked()
    {
        if (workersStarted_)
            return;
        workersStarted_ = true;
        registerStopAtExit();
        for (size_t i = 0; i < kWorkerCount; ++i)
            threads_.emplace_back([this] { workerLoop(); });
    }

    void startTimerLocked()
    {
        if (timerStarted_)
            return;
        timerStarted_ = true;
        registerStopAtExit();
        threads_.emplace_back([this] { timerLoop(); });
    }

    static void registerStopAtExit();

    std::mutex mutex_;
    std::condition_variable workAvailable_;
    std::condition_variable idle_;
    std::condition_variable timerWake_;
    std::array<std::deque<dispatch_block_t>, kPriorityCount> queues_;
    std::vector<DelayedBlock> delayed_;
    std::vector<std::thread> threads_;
    size_t queued_ = 0;
    size_t running_ = 0;
    size_t draining_ = 0; // running blocks that are waiting in drain()
    uint64_t nextOrder_ = 0;
    bool workersStarted_ = false;
    bool timerStarted_ = false;
    bool stopping_ = false;
};

Pool& pool()
{
    static Pool* const instance = new Pool;
    return *instance;
}

// A function-local static is destroyed in reverse order of construction, so
// the pool stops before anything that existed when its first thread started.
struct StopAtExit {
    ~StopAtExit() { pool().stop(); }
};

void Pool::registerStopAtExit() { static StopAtExit stopAtExit; }

std::atomic<VPDelayMode> delayMode{VPDelayMode::Real};

// A null queue (an unknown priority) is a programming error: stop at once
// rather than lose the work silently.
void requireQueue(dispatch_queue_t queue, const char* caller)
{
    if (!queue) {
        std::fprintf(stderr, "%s: null queue\n", caller);
        std::abort();
    }
}

} // namespace

dispatch_queue_t dispatch_get_global_queue(long identifier, unsigned long flags)
{
    switch (identifier) {
    case DISPATCH_QUEUE_PRIORITY_HIGH:
        return &globalQueues[0];
    case DISPATCH_QUEUE_PRIORITY_DEFAULT:
        return &globalQueues[1];
    case DISPATCH_QUEUE_PRIORITY_LOW:
        return &globalQueues[2];
    case DISPATCH_QUEUE_PRIORITY_BACKGROUND:
        return &globalQueues[3];
    default:
        return nullptr;
    }
}

dispatch_time_t dispatch_time(dispatch_time_t when, int64_t delta)
{
    if (when == DISPATCH_TIME_FOREVER)
        return DISPATCH_TIME_FOREVER;
    uint64_t base = when == DISPATCH_TIME_NOW ? nowNanoseconds() : when;
    if (delta >= 0) {
        uint64_t d = uint64_t(delta);
        return d >= DISPATCH_TIME_FOREVER - base ? DISPATCH_TIME_FOREVER - 1 : base + d;
    }
    uint64_t back = uint64_t(-(delta + 1)) + 1; // |delta| without overflowing INT64_MIN
    return back >= base ? 1 : base - back;      // 0 would read as "now"
}

void dispatch_async(dispatch_queue_t queue, dispatch_block_t block)
{
    requireQueue(queue, "dispatch_async");
    if (block)
        pool().enqueue(queue, std::move(block));
}

void dispatch_after(dispatch_time_t when, dispatch_queue_t queue, dispatch_block_t block)
{
    requireQueue(queue, "dispatch_after");
    if (!block)
        return;
    VPDelayMode mode = delayMode.load();
    if (mode == VPDelayMode::Immediate)
        pool().enqueue(queue, std::move(block));
    else
        pool().enqueueDelayed(when, queue, std::move(block), mode == VPDelayMode::Manual);
}

void VPDispatchSetDelayMode(VPDelayMode mode) { delayMode.store(mode); }
VPDelayMode VPDispatchGetDelayMode() { return delayMode.load(); }
void VPDispatchDrain() { pool().drain(); }
size_t VPDispatchPendingDelayed() { return pool().pendingDelayed(); }
size_t VPDispatchFireDelayed() { return pool().fireDelayed(); }
size_t VPDispatchWorkerCount() { return kWorkerCount; }
