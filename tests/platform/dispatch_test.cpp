#include <VantishPlatform/DispatchControl.h>
#include <dispatch/dispatch.h>
#include <mach/mach_time.h>

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdlib>
#include <limits>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <unistd.h>
#include <vector>

namespace {

using namespace std::chrono_literals;

// Records steps in the order they happen; waits give up after a while so
// that a fault fails the test instead of hanging it.
class Trace {
public:
    void add(const std::string& step = "")
    {
        std::lock_guard lock(mutex_);
        steps_.push_back(step);
        cv_.notify_all();
    }
    bool waitFor(size_t n)
    {
        std::unique_lock lock(mutex_);
        return cv_.wait_for(lock, 10s, [&] { return steps_.size() >= n; });
    }
    std::vector<std::string> steps()
    {
        std::lock_guard lock(mutex_);
        return steps_;
    }

private:
    std::mutex mutex_;
    std::condition_variable cv_;
    std::vector<std::string> steps_;
};

dispatch_queue_t queue(long priority) { return dispatch_get_global_queue(priority, 0); }

// Keeps all workers but one busy, so that the queue order becomes the run
// order of that one worker.
class OneFreeWorker {
public:
    OneFreeWorker()
    {
        int held = int(VPDispatchWorkerCount()) - 1;
        for (int i = 0; i < held; ++i)
            dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_HIGH), [this] {
                started_.add();
                released_.waitFor(1);
            });
        EXPECT_TRUE(started_.waitFor(held));
    }
    ~OneFreeWorker()
    {
        released_.add();
        VPDispatchDrain();
    }

private:
    Trace started_, released_;
};

class DispatchTest : public ::testing::Test {
protected:
    void TearDown() override
    {
        VPDispatchSetDelayMode(VPDelayMode::Real);
        VPDispatchFireDelayed();
        VPDispatchDrain();
    }
};

TEST_F(DispatchTest, HigherPriorityFirstFifoWithin)
{
    Trace trace;
    {
        OneFreeWorker one;
        Trace release;
        dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_HIGH), [&] { release.waitFor(1); }); // the free one
        for (auto [priority, name] : {std::pair{DISPATCH_QUEUE_PRIORITY_LOW, "low1"},
                                      {DISPATCH_QUEUE_PRIORITY_BACKGROUND, "background"},
                                      {DISPATCH_QUEUE_PRIORITY_DEFAULT, "default1"},
                                      {DISPATCH_QUEUE_PRIORITY_HIGH, "high1"},
                                      {DISPATCH_QUEUE_PRIORITY_DEFAULT, "default2"},
                                      {DISPATCH_QUEUE_PRIORITY_HIGH, "high2"},
                                      {DISPATCH_QUEUE_PRIORITY_LOW, "low2"}})
            dispatch_async(queue(priority), [&trace, label = name] { trace.add(label); });
        release.add();
        ASSERT_TRUE(trace.waitFor(7));
    }
    EXPECT_EQ(trace.steps(),
              (std::vector<std::string>{"high1", "high2", "default1", "default2", "low1", "low2", "background"}));
    EXPECT_EQ(queue(1), nullptr); // the four priorities only
}

TEST_F(DispatchTest, BlocksRunConcurrently)
{
    const int workers = int(VPDispatchWorkerCount());
    Trace arrived;
    std::atomic<int> sawAll{0};
    for (int i = 0; i < workers; ++i) {
        dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_HIGH), [&] {
            arrived.add();
            if (arrived.waitFor(workers))
                ++sawAll;
        });
    }
    VPDispatchDrain();
    EXPECT_EQ(sawAll.load(), workers);
}

TEST_F(DispatchTest, DrainWaitsForWorkQueuedByRunningWork)
{
    Trace trace;
    dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_HIGH), [&] {
        trace.add("first");
        std::this_thread::sleep_for(2ms);
        dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_DEFAULT), [&] {
            trace.add("second");
            std::this_thread::sleep_for(1ms);
            dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_BACKGROUND), [&] { trace.add("third"); });
        });
    });
    VPDispatchDrain();
    EXPECT_EQ(trace.steps(), (std::vector<std::string>{"first", "second", "third"}));
}

// Drain from a block waits for the other work, not for itself, and cannot
// starve even when every worker drains at once.
TEST_F(DispatchTest, DrainFromBlocksFinishes)
{
    const int blocks = int(VPDispatchWorkerCount()) * 2;
    std::atomic<int> children{0};
    std::atomic<int> drainedAfterChildren{0};
    for (int i = 0; i < blocks; ++i) {
        dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_DEFAULT), [&] {
            auto child = std::make_shared<std::atomic<bool>>(false);
            dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_LOW), [&children, child] {
                ++children;
                *child = true;
            });
            VPDispatchDrain();
            if (*child)
                ++drainedAfterChildren;
        });
    }
    VPDispatchDrain();
    EXPECT_EQ(children.load(), blocks);
    EXPECT_EQ(drainedAfterChildren.load(), blocks);
}

TEST_F(DispatchTest, ImmediateModeRunsDelayedWorkAtOnce)
{
    VPDispatchSetDelayMode(VPDelayMode::Immediate);
    EXPECT_EQ(VPDispatchGetDelayMode(), VPDelayMode::Immediate);
    std::atomic<bool> ran{false};
    dispatch_after(dispatch_time(DISPATCH_TIME_NOW, int64_t(3600 * NSEC_PER_SEC)), queue(DISPATCH_QUEUE_PRIORITY_HIGH),
                   [&] { ran = true; });
    EXPECT_EQ(VPDispatchPendingDelayed(), 0u);
    VPDispatchDrain();
    EXPECT_TRUE(ran.load());
}

TEST_F(DispatchTest, ManualModeHoldsWorkUntilFiredThenRunsItByDueTime)
{
    VPDispatchSetDelayMode(VPDelayMode::Manual);
    Trace trace;
    auto after = [&](int64_t ns, const char* name) {
        dispatch_after(dispatch_time(DISPATCH_TIME_NOW, ns), queue(DISPATCH_QUEUE_PRIORITY_HIGH),
                       [&trace, name] { trace.add(name); });
    };
    after(int64_t(5 * NSEC_PER_SEC), "five");
    after(0, "now");
    after(int64_t(1 * NSEC_PER_SEC), "one");
    dispatch_after(DISPATCH_TIME_NOW, queue(DISPATCH_QUEUE_PRIORITY_HIGH), [&] { trace.add("zero"); });

    VPDispatchDrain();
    EXPECT_TRUE(trace.steps().empty());
    EXPECT_EQ(VPDispatchPendingDelayed(), 4u);

    // Held work stays held when the mode changes back.
    VPDispatchSetDelayMode(VPDelayMode::Real);
    VPDispatchDrain();
    EXPECT_EQ(VPDispatchPendingDelayed(), 4u);

    {
        OneFreeWorker one;
        EXPECT_EQ(VPDispatchFireDelayed(), 4u);
        EXPECT_EQ(VPDispatchPendingDelayed(), 0u);
        // Let the one free worker run all four before the others are let go,
        // or a freed worker may take "five" while "one" is still running.
        EXPECT_TRUE(trace.waitFor(4));
    }
    EXPECT_EQ(trace.steps(), (std::vector<std::string>{"zero", "now", "one", "five"}));
}

// Work not yet due does not hold up Drain; due work runs without being fired.
TEST_F(DispatchTest, RealModeRunsWorkWhenDue)
{
    std::atomic<bool> late{false};
    dispatch_after(dispatch_time(DISPATCH_TIME_NOW, int64_t(3600 * NSEC_PER_SEC)), queue(DISPATCH_QUEUE_PRIORITY_LOW),
                   [&] { late = true; });
    Trace done;
    std::atomic<uint64_t> ranAt{0};
    uint64_t start = mach_absolute_time();
    dispatch_after(dispatch_time(DISPATCH_TIME_NOW, int64_t(3 * NSEC_PER_MSEC)), queue(DISPATCH_QUEUE_PRIORITY_HIGH),
                   [&] {
                       ranAt = mach_absolute_time();
                       done.add();
                   });
    ASSERT_TRUE(done.waitFor(1));
    EXPECT_GE(ranAt.load() - start, 3 * NSEC_PER_MSEC);
    VPDispatchDrain();
    EXPECT_FALSE(late.load());
    EXPECT_EQ(VPDispatchPendingDelayed(), 1u);
    EXPECT_EQ(VPDispatchFireDelayed(), 1u);
    VPDispatchDrain();
    EXPECT_TRUE(late.load());
}

TEST_F(DispatchTest, TimesSaturateInsteadOfWrapping)
{
    EXPECT_EQ(dispatch_time(DISPATCH_TIME_FOREVER, 5), DISPATCH_TIME_FOREVER);
    EXPECT_EQ(dispatch_time(1000, 500), 1500u);
    EXPECT_EQ(dispatch_time(1000, -400), 600u);
    EXPECT_NE(dispatch_time(1000, -5000), DISPATCH_TIME_NOW);
    EXPECT_LT(dispatch_time(1000, -5000), 1000u);
    EXPECT_GT(dispatch_time(DISPATCH_TIME_FOREVER - 10, std::numeric_limits<int64_t>::max()), 1000u);
    EXPECT_NE(dispatch_time(DISPATCH_TIME_FOREVER - 10, std::numeric_limits<int64_t>::max()), DISPATCH_TIME_FOREVER);
}

// Leaving the process while work is queued, delayed or running neither
// crashes nor hangs, and queued work does not run once exit has begun.
TEST(DispatchExitDeathTest, ExitWithWorkQueued)
{
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(
        {
            for (size_t i = 0; i < VPDispatchWorkerCount(); ++i)
                dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_HIGH), [] { std::this_thread::sleep_for(50ms); });
            dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_LOW), [] { _exit(3); });
            dispatch_after(dispatch_time(DISPATCH_TIME_NOW, int64_t(3600 * NSEC_PER_SEC)),
                           queue(DISPATCH_QUEUE_PRIORITY_HIGH), [] { _exit(4); });
            std::exit(7);
        },
        ::testing::ExitedWithCode(7), "");
}

TEST(DispatchExitDeathTest, ExitFromABlock)
{
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(
        {
            dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_DEFAULT), [] { std::this_thread::sleep_for(5ms); });
            dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_HIGH), [] { std::exit(5); });
            for (;;)
                std::this_thread::sleep_for(1ms);
        },
        ::testing::ExitedWithCode(5), "");
}

} // namespace
