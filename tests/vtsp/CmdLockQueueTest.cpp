// The blocking queue between the link's threads: refusal while not running,
// FIFO order, waking and closing a waiting consumer, pausing with reset, and
// the references it holds on the commands that pass through it.
#include <android/log.h>
#include <gtest/gtest.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <future>
#include <memory>
#include <string>
#include <thread>

#include "CmdBuffer.h"
#include "CmdLockQueue.h"
#include "LogCapture.h"
#include "VtspRecord.h"

using namespace android;
using namespace std::chrono_literals;

namespace {

using Elem = std::shared_ptr<CmdBuffer>;
using Queue = CmdLockQueue<Elem>;

const char* const kRefused = "pushAndSignal: failed to push elem";

Elem command(int32_t code) {
    return std::make_shared<CmdBuffer>(VPR_COMM_VTSP_CMD, vtspcodec::commandRecord(code).body);
}

// Scheduler state of one of our threads ('S' while it sleeps in the kernel).
char taskState(pid_t tid) {
    std::ifstream stat("/proc/self/task/" + std::to_string(tid) + "/stat");
    std::string text((std::istreambuf_iterator<char>(stat)), std::istreambuf_iterator<char>());
    const size_t paren = text.rfind(')');
    return paren == std::string::npos || paren + 2 >= text.size() ? '?' : text[paren + 2];
}

struct Popped {
    bool ok = false;
    Elem elem;
};

// A consumer thread blocked in waitAndPop. Its result is a future, so a test
// can tell "still waiting" from "returned" without sleeping blindly.
class Consumer {
public:
    explicit Consumer(Queue& queue) : mQueue(queue) {
        std::promise<pid_t> tid;
        std::future<pid_t> tidReady = tid.get_future();
        mResult = std::async(std::launch::async, [&queue, tid = std::move(tid)]() mutable {
            tid.set_value(static_cast<pid_t>(syscall(SYS_gettid)));
            Popped p;
            p.ok = queue.waitAndPop(p.elem);
            return p;
        });
        mTid = tidReady.get();
    }
    // A test that failed half-way must not hang on a consumer still waiting;
    // one that even a close cannot release ends the run at once.
    ~Consumer() {
        if (!mResult.valid() || returnedWithin(0ms)) return;
        mQueue.destroy();
        if (!returnedWithin(2s)) {
            fprintf(stderr, "consumer still blocked in waitAndPop after destroy\n");
            std::abort();
        }
    }
    Consumer(const Consumer&) = delete;
    Consumer& operator=(const Consumer&) = delete;

    // True once the thread sleeps inside waitAndPop; a push or close that
    // comes after this really has to wake it.
    bool sleeping() const {
        const auto deadline = std::chrono::steady_clock::now() + 5s;
        while (std::chrono::steady_clock::now() < deadline) {
            if (mResult.wait_for(0s) == std::future_status::ready) return false;
            if (taskState(mTid) == 'S') return true;
            std::this_thread::sleep_for(1ms);
        }
        return false;
    }
    bool returnedWithin(std::chrono::milliseconds window) const {
        return mResult.wait_for(window) == std::future_status::ready;
    }
    Popped result() { return mResult.get(); }

private:
    Queue& mQueue;
    std::future<Popped> mResult;
    pid_t mTid = 0;
};

}  // namespace

TEST(CmdLockQueue, NeverStartedQueueRefusesPushesAndDoesNotWait) {
    LogCapture log;
    Queue queue;
    Elem elem = command(81);
    queue.pushAndSignal(elem);
    EXPECT_EQ(1u, log.count(ANDROID_LOG_ERROR, "VTSPManager", kRefused));
    EXPECT_EQ(1, elem.use_count());  // the refused element is neither kept nor released

    Elem out;
    EXPECT_FALSE(queue.waitAndPop(out));  // closed: returns at once
    EXPECT_EQ(nullptr, out);
}

TEST(CmdLockQueue, ElementsLeaveInTheOrderTheyCame) {
    LogCapture log;
    Queue queue;
    queue.start();
    Elem first = command(81);
    queue.pushAndSignal(first);
    EXPECT_EQ(2, first.use_count());  // the queue holds its own reference
    queue.pushAndSignal(command(82));
    queue.pushAndSignal(command(88));

    for (int32_t code : {81, 82, 88}) {
        Elem out;
        ASSERT_TRUE(queue.waitAndPop(out));
        EXPECT_EQ(code, out->command().code);
    }
    EXPECT_EQ(1, first.use_count());
    EXPECT_EQ(0u, log.count(ANDROID_LOG_ERROR, "VTSPManager", kRefused));
}

TEST(CmdLockQueue, BlockedConsumerWakesWithThePushedElement) {
    Queue queue;
    queue.start();
    Consumer consumer(queue);
    ASSERT_TRUE(consumer.sleeping());
    queue.pushAndSignal(command(82));
    ASSERT_TRUE(consumer.returnedWithin(5s));
    Popped p = consumer.result();
    EXPECT_TRUE(p.ok);
    ASSERT_NE(nullptr, p.elem);
    EXPECT_EQ(82, p.elem->command().code);
}

TEST(CmdLockQueue, DestroyReleasesAWaitingConsumerAndEveryLaterWait) {
    Queue queue;
    queue.start();
    Consumer consumer(queue);
    ASSERT_TRUE(consumer.sleeping());
    queue.destroy();
    ASSERT_TRUE(consumer.returnedWithin(5s));
    Popped p = consumer.result();
    EXPECT_FALSE(p.ok);
    EXPECT_EQ(nullptr, p.elem);

    Popped again;
    again.elem = command(15);
    again.ok = queue.waitAndPop(again.elem);  // a hang here fails the test by its time limit
    EXPECT_FALSE(again.ok);
    ASSERT_NE(nullptr, again.elem);
    EXPECT_EQ(15, again.elem->command().code);  // the output is left as it was

    // A closed queue can be started again.
    queue.start();
    queue.pushAndSignal(command(88));
    Elem out;
    ASSERT_TRUE(queue.waitAndPop(out));
    EXPECT_EQ(88, out->command().code);
}

TEST(CmdLockQueue, ResetDiscardsRefusesAndKeepsTheConsumerWaitingUntilRestarted) {
    LogCapture log;
    Queue queue;
    queue.start();
    std::weak_ptr<CmdBuffer> a = [&] { Elem e = command(81); queue.pushAndSignal(e); return e; }();
    std::weak_ptr<CmdBuffer> b = [&] { Elem e = command(82); queue.pushAndSignal(e); return e; }();
    ASSERT_FALSE(a.expired());
    queue.reset();
    EXPECT_TRUE(a.expired());
    EXPECT_TRUE(b.expired());

    Consumer consumer(queue);
    ASSERT_TRUE(consumer.sleeping());  // a stopped, empty queue makes its consumer wait
    queue.reset();                     // and resetting again does not wake it
    EXPECT_FALSE(consumer.returnedWithin(50ms));

    Elem refused = command(88);
    queue.pushAndSignal(refused);
    EXPECT_EQ(1u, log.count(ANDROID_LOG_ERROR, "VTSPManager", kRefused));
    EXPECT_EQ(1, refused.use_count());
    EXPECT_FALSE(consumer.returnedWithin(50ms));

    queue.start();
    queue.pushAndSignal(command(15));
    ASSERT_TRUE(consumer.returnedWithin(5s));
    Popped p = consumer.result();
    EXPECT_TRUE(p.ok);
    ASSERT_NE(nullptr, p.elem);
    EXPECT_EQ(15, p.elem->command().code);  // nothing from before the reset survived
}

TEST(CmdLockQueue, DestroyReleasesHeldElementsAndDeliversNoneOfThem) {
    Queue queue;
    queue.start();
    std::weak_ptr<CmdBuffer> held[3];
    for (auto& w : held) {
        Elem e = command(81);
        queue.pushAndSignal(e);
        w = e;
    }
    for (auto& w : held) ASSERT_FALSE(w.expired());
    queue.destroy();
    for (auto& w : held) EXPECT_TRUE(w.expired());
    Elem out;
    EXPECT_FALSE(queue.waitAndPop(out));
    EXPECT_EQ(nullptr, out);
}

TEST(CmdLockQueue, PoppingIntoAnOccupiedElementReleasesItsEarlierCommand) {
    Queue queue;
    queue.start();
    Elem out = command(81);
    std::weak_ptr<CmdBuffer> earlier = out;
    queue.pushAndSignal(command(82));
    ASSERT_TRUE(queue.waitAndPop(out));
    EXPECT_TRUE(earlier.expired());
    EXPECT_EQ(82, out->command().code);
    EXPECT_EQ(1, out.use_count());  // the queue kept no reference of its own
}
