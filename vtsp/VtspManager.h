// The command link to the modem: three threads around the modem pipe.
//
//   tVtspCmdRx  reads whole 3664-byte records, routes them by target module
//               and queues video commands on mRxQueue;
//   tVtspCmdHd  converts each command to host order, logs it, hands it to the
//               stream dispatcher and queues its reply on mTxQueue;
//   tVtspCmdTx  writes each reply as a whole record.
//
// SIGUSR1 (installed without SA_RESTART) interrupts a thread blocked in the
// device so that destroy() can end it. A reply that has begun to go out is
// finished even while the link stops; one the device does not take in time
// is kept, and its rest goes out first when the link runs again, so the
// modem never sees a record cut short.
#ifndef QUELLBORN_VTSP_VTSPMANAGER_H
#define QUELLBORN_VTSP_VTSPMANAGER_H

#include <pthread.h>

#include <atomic>
#include <memory>

#include "CameraCodecParameter.h"
#include "CmdBuffer.h"
#include "CmdCallbackMvd.h"
#include "CmdLockQueue.h"
#include "CommandHistory.h"

namespace android {

constexpr const char* kModemPipePath = "/dev/spipe_lte9";

class VtspManager {
public:
    struct CameraResolution {
        int32_t width;
        int32_t height;
        int32_t frameRate;
    };

    // The process's link, created on first use (the engine's constructor is
    // the first caller, before any other user exists).
    static VtspManager* getInstance();

    // A modem writing faster than commands are handled must not grow the
    // receive queue without bound (each queued command holds a few
    // kilobytes). At the high-water mark the receive thread stops reading
    // until the handling thread has taken the queue below the low-water
    // mark; meanwhile the pipe's own buffer fills and the modem's writes
    // wait. Nothing is refused or reordered. The gap between the marks lets
    // the receiver read a batch per wake-up.
    static constexpr size_t kRxHighWater = 64;
    static constexpr size_t kRxLowWater = 32;

    // A link of its own on `devName`; tests and tools use this to run a link
    // on a pseudo-terminal without touching the process singleton.
    explicit VtspManager(const char* devName);
    // Ends the threads before the members they use go away.
    ~VtspManager();
    VtspManager(const VtspManager&) = delete;
    VtspManager& operator=(const VtspManager&) = delete;

    bool init();
    void start();
    void stop();
    void destroy();
    CmdBuffer* parse(std::shared_ptr<CmdBuffer> cmd);
    bool getCameraResolution(CameraCodecParameter::CameraConfigEnum config, CameraResolution& out);

    static void* cmdRxFunc(void* arg);
    static void* cmdTxFunc(void* arg);
    static void* cmdHandleFunc(void* arg);
    static int readFromVpr(VtspManager* vm, unsigned char* buf, int len);
    static int writeToVpr(VtspManager* vm, const unsigned char* buf, int len);

    int mFd;
    std::shared_ptr<CameraCodecParameter> mCameraCodecParameter;
    std::shared_ptr<CmdCallbackMvd> mCmdCallback;
    const char* mDevName;
    std::atomic<bool> mRxRunning;
    std::atomic<bool> mTxRunning;
    pthread_t mRxThread;
    pthread_t mTxThread;
    pthread_t mHandleThread;
    CmdLockQueue<std::shared_ptr<CmdBuffer>> mRxQueue;
    CmdLockQueue<std::shared_ptr<CmdBuffer>> mTxQueue;

    // What the link has done since it was made, counted by its threads.
    struct LinkCounters {
        std::atomic<uint64_t> recordsRead{0};
        std::atomic<uint64_t> bytesRead{0};
        std::atomic<uint64_t> readFailures{0};
        std::atomic<int> lastReadErrno{0};  // 0 with failures: end of file
        std::atomic<uint64_t> recordsWritten{0};
        std::atomic<uint64_t> bytesWritten{0};
        std::atomic<uint64_t> writeFailures{0};
        std::atomic<int> lastWriteErrno{0};
        // Transfers tried again after one that moved nothing (interrupted or failed).
        std::atomic<uint64_t> retries{0};
        // Commands received, and replies made, while the link was stopped: lost.
        std::atomic<uint64_t> commandsRefused{0};
        std::atomic<uint64_t> repliesRefused{0};
        std::atomic<bool> deviceOpen{false};
        std::atomic<bool> rxRunning{false};
        std::atomic<bool> handleRunning{false};
        std::atomic<bool> txRunning{false};
    };
    // A copy of the link's state for diagnostics; never waits on the device
    // or the media engine, only on the queues' own short locks.
    struct LinkStatus {
        const char* devName;
        bool deviceOpen, rxRunning, handleRunning, txRunning;
        uint64_t recordsRead, bytesRead, readFailures;
        int lastReadErrno;
        uint64_t recordsWritten, bytesWritten, writeFailures;
        int lastWriteErrno;
        uint64_t retries, commandsRefused, repliesRefused;
        CmdLockQueue<std::shared_ptr<CmdBuffer>>::Depth rxDepth, txDepth;
    };
    LinkStatus linkStatus();

    LinkCounters mCounters;
    CommandHistory mHistory;

private:
    // Set by each thread as its last act, so destroy() knows when to stop
    // re-sending SIGUSR1 to it.
    std::atomic<bool> mRxEnded{false};
    std::atomic<bool> mTxEnded{false};

    void joinThread(pthread_t& thread, std::atomic<bool>* ended, const char* name);
    // Writes `record` from byte `from` on; answers how far it got.
    int writeFrom(const unsigned char* record, int from);
    // Writes the rest of a record left unfinished when the link last
    // stopped; false while some of it is still unwritten.
    bool finishUnsentRecord();

    // Transmit side only (one transmit thread at a time, each started after
    // the last one was joined): a record abandoned part-way, and how much of
    // it the device has taken.
    VPR_Comm mUnsent{};
    int mUnsentFrom = 0;

    static VtspManager* sVm;
};

// SIGUSR1 handler: does nothing; its only purpose is to make a blocked read or
// write fail with EINTR.
void fakeHandler(int sig);

}  // namespace android

#endif  // QUELLBORN_VTSP_VTSPMANAGER_H
