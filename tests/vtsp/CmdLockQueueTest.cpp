// The blocking queue between the link's threads: refusal while not running,
// FIFO order, a producer waiting for room, and the references it holds on
// the commands that pass through it. Waking and closing a waiting consumer,
// restarting, pausing, and a pause or shutdown that ends a wait for room are
// seen from the link's side in VtspManagerTest.
#include <android/log.h>
#include <gtest/gtest.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <chrono>
#include <fstream>
#include <future>
#include <memory>
#include <string>

#include "CmdBuffer.h"
#include "CmdLockQueue.h"
#include "Eventually.h"
#include "LogCapture.h"
#include "VtspRecord.h"

using namespace android;
using namespace std::chrono_literals;

namespace {

using Elem = std::shared_ptr<CmdBuffer>;
using Queue = CmdLockQueue<Elem>;

Elem command(int32_t code) {
    return std::make_shared<CmdBuffer>(VPR_COMM_VTSP_CMD, vtspcodec::commandRecord(code).body);
}

// Pushes a command and returns a handle that tells whether anyone still holds it.
std::weak_ptr<CmdBuffer> pushed(Queue& queue, int32_t code) {
    Elem e = command(code);
    queue.pushAndSignal(e);
    return e;
}

size_t refusals(const LogCapture& log) {
    return log.count(ANDROID_LOG_ERROR, "VTSPManager", "pushAndSignal: failed to push elem");
}

// Scheduler state of one of our threads ('S' while it sleeps in the kernel).
char taskState(pid_t tid) {
    std::ifstream stat("/proc/self/task/" + std::to_string(tid) + "/stat");
    std::string text((std::istreambuf_iterator<char>(stat)), std::istreambuf_iterator<char>());
    const size_t paren = text.rfind(')');
    return paren == std::string::npos || paren + 2 >= text.size() ? '?' : text[paren + 2];
}

// The code of the popped command, -2 when waitAndPop answered false.
int32_t pop(Queue& queue) {
    Elem elem;
    return queue.waitAndPop(elem) ? elem->command().code : -2;
}

// A thread blocked in one of the queue's waits, given as `body`. Its result
// is a future, so a test can tell "still waiting" from "returned" without
// sleeping blindly.
class Waiter {
public:
    Waiter(Queue& queue, int32_t (*body)(Queue&)) : mQueue(queue) {
        std::promise<pid_t> tid;
        std::future<pid_t> tidReady = tid.get_future();
        mResult = std::async(std::launch::async, [&queue, body, tid = std::move(tid)]() mutable {
            tid.set_value(static_cast<pid_t>(syscall(SYS_gettid)));
            return body(queue);
        });
        mTid = tidReady.get();
    }
    // A test that failed half-way must not hang on a thread still waiting;
    // one that even a close cannot release ends the run at once.
    ~Waiter() {
        if (!mResult.valid() || returnedWithin(0ms)) return;
        mQueue.destroy();
        if (!returnedWithin(2s)) {
            fprintf(stderr, "thread still blocked in the queue after destroy\n");
            std::abort();
        }
    }
    Waiter(const Waiter&) = delete;
    Waiter& operator=(const Waiter&) = delete;

    // True once the thread sleeps inside the wait; whatever comes after this
    // really has to wake it.
    bool sleeping() const {
        return eventually([&] { return returnedWithin(0ms) || taskState(mTid) == 'S'; }) && !returnedWithin(0ms);
    }
    bool returnedWithin(std::chrono::milliseconds window) const {
        return mResult.wait_for(window) == std::future_status::ready;
    }
    int32_t result() { return returnedWithin(5s) ? mResult.get() : -3; }

private:
    Queue& mQueue;
    std::future<int32_t> mResult;
    pid_t mTid = 0;
};

}  // namespace

TEST(CmdLockQueue, ClosedQueueRefusesAndDoesNotWaitARunningOneKeepsOrderAndDestroyReleases) {
    LogCapture log;
    Queue queue;
    Elem elem = command(81);
    queue.pushAndSignal(elem);  // never started
    EXPECT_EQ(1u, refusals(log));
    EXPECT_EQ(1, elem.use_count());  // the refused element is neither kept nor released
    EXPECT_EQ(-2, pop(queue));       // closed: returns at once

    queue.start();
    for (int32_t code : {81, 82, 88}) queue.pushAndSignal(command(code));
    for (int32_t code : {81, 82, 88}) EXPECT_EQ(code, pop(queue));
    EXPECT_EQ(1u, refusals(log));

    // Destroy releases what it held and delivers none of it.
    std::weak_ptr<CmdBuffer> held[] = {pushed(queue, 81), pushed(queue, 82)};
    for (auto& w : held) ASSERT_FALSE(w.expired());
    queue.destroy();
    for (auto& w : held) EXPECT_TRUE(w.expired());
    EXPECT_EQ(-2, pop(queue));
}

TEST(CmdLockQueue, ProducerWaitsForRoomFromTheHighMarkToBelowTheLowMark) {
    const auto waitForRoom = [](Queue& q) {
        q.waitForRoom(4, 2);
        return int32_t{0};
    };
    Queue queue;
    queue.start();
    for (int32_t code : {81, 82, 83}) queue.pushAndSignal(command(code));
    EXPECT_EQ(0, waitForRoom(queue));  // below the high mark: returns at once
    queue.pushAndSignal(command(84));
    Waiter producer(queue, waitForRoom);
    ASSERT_TRUE(producer.sleeping());
    EXPECT_EQ(81, pop(queue));
    EXPECT_EQ(82, pop(queue));
    EXPECT_FALSE(producer.returnedWithin(50ms));  // two left: not below the low mark yet
    EXPECT_EQ(83, pop(queue));
    EXPECT_EQ(0, producer.result());
    EXPECT_EQ(4u, queue.peakSize());
}
