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

// A flag that blocks can wait on; waits give up after a while so a fault
// fails the test instead of hanging it.
class Gate {
public:
    void open()
    {
        std::lock_guard lock(mutex_);
        open_ = true;
        cv_.notify_all();
    }
    bool wait()
    {
        std::unique_lock lock(mutex_);
        return cv_.wait_for(lock, 10s, [&] { return open_; });
    }

private:
    std::mutex mutex_;
    std::condition_variable cv_;
    bool open_ = false;
};

class Counter {
public:
    void add()
    {
        std::lock_guard lock(mutex_);
        ++count_;
        cv_.notify_all();
    }
    bool waitFor(int n)
    {
        std::unique_lock lock(mutex_);
        return cv_.wait_for(lock, 10s, [&] { return count_ >= n; });
    }
    int count()
    {
        std::lock_guard lock(mutex_);
        return count_;
    }

private:
    std::mutex mutex_;
    std::condition_variable cv_;
    int count_ = 0;
};

class Trace {
public:
    void add(const std::string& step)
    {
        std::lock_guard lock(mutex_);
        steps_.push_back(step);
    }
    std::vector<std::string> steps()
    {
        std::lock_guard lock(mutex_);
        return steps_;
    }

private:
    std::mutex mutex_;
    std::vector<std::string> steps_;
};

dispatch_queue_t queue(long priority) { return dispatch_get_global_queue(priority, 0); }

class DispatchTest : public ::testing::Test {
protected:
    void TearDown() override
    {
        VPDispatchSetDelayMode(VPDelayMode::Real);
        VPDispatchFireDelayed();
        VPDispatchDrain();
    }
};

TEST_F(DispatchTest, GlobalQueuesExistForTheFourPrioritiesOnly)
{
    std::vector<dispatch_queue_t> queues = {queue(DISPATCH_QUEUE_PRIORITY_HIGH), queue(DISPATCH_QUEUE_PRIORITY_DEFAULT),
                                            queue(DISPATCH_QUEUE_PRIORITY_LOW),
                                            queue(DISPATCH_QUEUE_PRIORITY_BACKGROUND)};
    for (size_t i = 0; i < queues.size(); ++i) {
        ASSERT_NE(queues[i], nullptr);
        for (size_t j = 0; j < i; ++j)
            EXPECT_NE(queues[i], queues[j]);
    }
    EXPECT_EQ(queue(1), nullptr);
    EXPECT_EQ(queue(DISPATCH_QUEUE_PRIORITY_HIGH), queues[0]);
}

// With every worker held but one, that one worker takes the queued blocks
// highest priority first and in submission order within a priority.
TEST_F(DispatchTest, HigherPriorityFirstFifoWithin)
{
    const size_t workers = VPDispatchWorkerCount();
    std::vector<std::unique_ptr<Gate>> gates;
    Counter started;
    for (size_t i = 0; i < workers; ++i) {
        gates.push_back(std::make_unique<Gate>());
        Gate* gate = gates.back().get();
        dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_DEFAULT), [&started, gate] {
            started.add();
            gate->wait();
        });
    }
    ASSERT_TRUE(started.waitFor(int(workers)));

    Trace trace;
    Counter done;
    auto step = [&](long priority, const char* name) {
        dispatch_async(queue(priority), [&trace, &done, name] {
            trace.add(name);
            done.add();
        });
    };
    step(DISPATCH_QUEUE_PRIORITY_LOW, "low1");
    step(DISPATCH_QUEUE_PRIORITY_BACKGROUND, "background");
    step(DISPATCH_QUEUE_PRIORITY_DEFAULT, "default1");
    step(DISPATCH_QUEUE_PRIORITY_HIGH, "high1");
    step(DISPATCH_QUEUE_PRIORITY_DEFAULT, "default2");
    step(DISPATCH_QUEUE_PRIORITY_HIGH, "high2");
    step(DISPATCH_QUEUE_PRIORITY_LOW, "low2");

    gates[0]->open();
    ASSERT_TRUE(done.waitFor(7));
    for (auto& gate : gates)
        gate->open();
    VPDispatchDrain();
    EXPECT_EQ(trace.steps(),
              (std::vector<std::string>{"high1", "high2", "default1", "default2", "low1", "low2", "background"}));
}

TEST_F(DispatchTest, BlocksRunConcurrently)
{
    const int workers = int(VPDispatchWorkerCount());
    Counter arrived;
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

    // One worker at a time, so that the queue order is the run order.
    const size_t workers = VPDispatchWorkerCount();
    std::vector<std::unique_ptr<Gate>> gates;
    Counter started;
    for (size_t i = 0; i + 1 < workers; ++i) {
        gates.push_back(std::make_unique<Gate>());
        Gate* gate = gates.back().get();
        dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_HIGH), [&started, gate] {
            started.add();
            gate->wait();
        });
    }
    ASSERT_TRUE(started.waitFor(int(workers) - 1));
    EXPECT_EQ(VPDispatchFireDelayed(), 4u);
    EXPECT_EQ(VPDispatchPendingDelayed(), 0u);
    Counter done;
    dispatch_async(queue(DISPATCH_QUEUE_PRIORITY_BACKGROUND), [&] { done.add(); });
    ASSERT_TRUE(done.waitFor(1));
    for (auto& gate : gates)
        gate->open();
    VPDispatchDrain();
    EXPECT_EQ(trace.steps(), (std::vector<std::string>{"zero", "now", "one", "five"}));
}

TEST_F(DispatchTest, RealModeRunsWorkWhenDue)
{
    Counter done;
    std::atomic<uint64_t> ranAt{0};
    uint64_t start = mach_absolute_time();
    dispatch_after(dispatch_time(DISPATCH_TIME_NOW, int64_t(3 * NSEC_PER_MSEC)), queue(DISPATCH_QUEUE_PRIORITY_HIGH),
                   [&] {
                       ranAt = mach_absolute_time();
                       done.add();
                   });
    ASSERT_TRUE(done.waitFor(1));
    EXPECT_GE(ranAt.load() - start, 3 * NSEC_PER_MSEC);
    EXPECT_EQ(VPDispatchPendingDelayed(), 0u);
}

TEST_F(DispatchTest, DrainIgnoresWorkNotYetDue)
{
    std::atomic<bool> ran{false};
    dispatch_after(dispatch_time(DISPATCH_TIME_NOW, int64_t(3600 * NSEC_PER_SEC)), queue(DISPATCH_QUEUE_PRIORITY_LOW),
                   [&] { ran = true; });
    VPDispatchDrain();
    EXPECT_FALSE(ran.load());
    EXPECT_EQ(VPDispatchPendingDelayed(), 1u);
    EXPECT_EQ(VPDispatchFireDelayed(), 1u);
    VPDispatchDrain();
    EXPECT_TRUE(ran.load());
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
