#include "VtspManager.h"

#include <android/log.h>
#include <fcntl.h>
#include <signal.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>

#include "ModemPipe.h"

namespace android {

namespace {

constexpr const char* kTag = "VTSPManager";
constexpr int kRecordSize = static_cast<int>(kVprCommSize);
constexpr unsigned int kDeviceRetrySeconds = 2;
using Clock = std::chrono::steady_clock;

// How often destroy() repeats SIGUSR1 while a device thread has not ended: a
// signal that lands between the thread's flag test and its read is lost.
constexpr useconds_t kResignalMicros = 5000;
// A record half written when the link is told to stop is finished, but a
// device that never takes the rest must not hold destroy() forever. Measured
// in time: destroy()'s own wake-ups interrupt the write every few ms.
constexpr auto kFinishRecordAfterStop = std::chrono::seconds(2);
// A device failing while such a record is finished is retried after this
// pause, not in a busy loop.
constexpr useconds_t kStoppedRetryMicros = 10000;
// destroy() stops waking a device thread after this long (longer than
// kFinishRecordAfterStop, the longest a woken thread may rightly take).
constexpr auto kWakeUpLimit = std::chrono::seconds(5);

void installSigusr1Handler() {
    struct sigaction action {};
    action.sa_handler = fakeHandler;
    sigemptyset(&action.sa_mask);
    action.sa_flags = 0;  // no SA_RESTART: a blocked read or write must fail with EINTR
    sigaction(SIGUSR1, &action, nullptr);
}

// A thread inherits the signal mask of the thread that created it; a link
// started from a thread that blocks SIGUSR1 could otherwise never be woken.
void acceptSigusr1() {
    sigset_t set;
    sigemptyset(&set);
    sigaddset(&set, SIGUSR1);
    pthread_sigmask(SIG_UNBLOCK, &set, nullptr);
}

long long msSince(Clock::time_point start) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - start).count();
}

void nameThread(const char* name) {
    if (pthread_setname_np(pthread_self(), name) != 0) {
        __android_log_print(ANDROID_LOG_ERROR, kTag, "Failed to set thread name, %s", name);
    }
}

const char* failureText(ssize_t result, int err) {
    return result == 0 ? "end of file" : strerror(err);
}

}  // namespace

VtspManager* VtspManager::sVm = nullptr;

void fakeHandler(int /*sig*/) {}

VtspManager* VtspManager::getInstance() {
    // A function-local static makes the first creation safe even if two
    // threads ever race to it; sVm keeps the instance visible to debuggers.
    static VtspManager* instance = sVm = new VtspManager(platformModemPipePath(kModemPipePath));
    return instance;
}

VtspManager::VtspManager(const char* devName)
        : mFd(-1),
          mCameraCodecParameter(std::make_shared<CameraCodecParameter>()),
          mCmdCallback(),
          mDevName(devName),
          mRxRunning(false),
          mTxRunning(false),
          mRxThread(0),
          mTxThread(0),
          mHandleThread(0) {
    mCameraCodecParameter->fill(CameraCodecParameter::CODEC_H264);
    mCameraCodecParameter->fill(CameraCodecParameter::CODEC_OTHER);
    mCmdCallback = std::make_shared<CmdCallbackMvd>(mCameraCodecParameter);
}

VtspManager::~VtspManager() {
    destroy();
}

bool VtspManager::init() {
    if (mFd == -1) mFd = open(mDevName, O_RDWR);
    mCounters.deviceOpen = mFd != -1;
    mRxRunning = true;
    mTxRunning = true;
    mRxQueue.start();
    mTxQueue.start();
    // destroy() may signal a device thread before it has installed the
    // handler itself, and SIGUSR1's default action ends the process.
    installSigusr1Handler();
    if (mRxThread == 0) {
        mRxEnded = false;
        // Counted as running from here, so a dump right after init never
        // shows a thread that has not been scheduled yet as stopped.
        mCounters.rxRunning = true;
        if (pthread_create(&mRxThread, nullptr, cmdRxFunc, this) != 0) {
            mRxThread = 0;
            mCounters.rxRunning = false;
        }
    }
    if (mTxThread == 0) {
        mTxEnded = false;
        mCounters.txRunning = true;
        if (pthread_create(&mTxThread, nullptr, cmdTxFunc, this) != 0) {
            mTxThread = 0;
            mCounters.txRunning = false;
        }
    }
    if (mHandleThread == 0) {
        mCounters.handleRunning = true;
        if (pthread_create(&mHandleThread, nullptr, cmdHandleFunc, this) != 0) {
            mHandleThread = 0;
            mCounters.handleRunning = false;
        }
    }
    return true;
}

void VtspManager::start() {
    mRxQueue.start();
    mTxQueue.start();
}

void VtspManager::stop() {
    mRxQueue.reset();
    mTxQueue.reset();
}

void VtspManager::joinThread(pthread_t& thread, std::atomic<bool>* ended, const char* name) {
    if (thread == 0) return;
    const auto began = Clock::now();
    while (ended != nullptr && !ended->load()) {
        if (Clock::now() - began >= kWakeUpLimit) {
            __android_log_print(ANDROID_LOG_ERROR, kTag, "%s: %s has not ended after %lld ms, no longer waking it",
                                "destroy", name, msSince(began));
            break;
        }
        pthread_kill(thread, SIGUSR1);
        usleep(kResignalMicros);
    }
    pthread_join(thread, nullptr);
    // Forgetting the handle lets a later init() start a fresh set of threads
    // and keeps a second destroy() from joining a thread twice.
    thread = 0;
}

void VtspManager::destroy() {
    mRxRunning = false;
    mTxRunning = false;
    mRxQueue.destroy();
    mTxQueue.destroy();
    joinThread(mRxThread, &mRxEnded, "tVtspCmdRx");
    joinThread(mTxThread, &mTxEnded, "tVtspCmdTx");
    joinThread(mHandleThread, nullptr, "tVtspCmdHd");
    if (mFd != -1) {
        close(mFd);
        mFd = -1;
    }
    mCounters.deviceOpen = false;
}

CmdBuffer* VtspManager::parse(std::shared_ptr<CmdBuffer> cmd) {
    return mCmdCallback->parse(*cmd);
}

VtspManager::LinkStatus VtspManager::linkStatus() {
    const LinkCounters& c = mCounters;
    return LinkStatus{mDevName,
                      c.deviceOpen,
                      c.rxRunning,
                      c.handleRunning,
                      c.txRunning,
                      c.recordsRead,
                      c.bytesRead,
                      c.readFailures,
                      c.lastReadErrno,
                      c.recordsWritten,
                      c.bytesWritten,
                      c.writeFailures,
                      c.lastWriteErrno,
                      c.retries,
                      c.commandsRefused,
                      c.repliesRefused,
                      mRxQueue.depth(),
                      mTxQueue.depth()};
}

bool VtspManager::getCameraResolution(CameraCodecParameter::CameraConfigEnum config,
                                      CameraResolution& out) {
    const CameraCodecParameter::Param p =
            mCameraCodecParameter->getParameter(config, CameraCodecParameter::CODEC_H264);
    out.width = p.width;
    out.height = p.height;
    out.frameRate = p.frameRate;
    return true;
}

void* VtspManager::cmdRxFunc(void* arg) {
    auto* vm = static_cast<VtspManager*>(arg);
    __android_log_print(ANDROID_LOG_DEBUG, kTag, "%s: cmdRxFunc E", "cmdRxFunc");
    auto record = std::make_unique<VPR_Comm>();
    installSigusr1Handler();
    acceptSigusr1();
    nameThread("tVtspCmdRx");

    int count = 0;
    while (vm->mRxRunning) {
        if (readFromVpr(vm, reinterpret_cast<unsigned char*>(record.get()), kRecordSize) <
            kRecordSize) {
            continue;
        }
        ++count;
        ++vm->mCounters.recordsRead;
        __android_log_print(ANDROID_LOG_DEBUG, kTag, "%s, recv msg %d, targetModule %d",
                            "cmdRxFunc", count, static_cast<int>(record->targetModule));
        if (record->targetModule == VPMD_VPAD_TARGET) {
            __android_log_print(ANDROID_LOG_DEBUG, kTag, "%s, recv VPMD_VPAD_TARGET, modem is active",
                                "cmdRxFunc");
            continue;
        }
        if (record->targetModule != VPMD_VIDEO_CMDEVT_TARGET) continue;
        if (record->type != 0) {
            __android_log_print(ANDROID_LOG_DEBUG, kTag,
                                "%s, msg %d, VPMD_VIDEO_CMDEVT_TARGET, type %d", "cmdRxFunc", count,
                                static_cast<int>(record->type));
            continue;
        }
        if (!vm->mRxQueue.pushAndSignal(CmdBuffer::fromRecord(*record))) ++vm->mCounters.commandsRefused;
        vm->mRxQueue.waitForRoom(kRxHighWater, kRxLowWater);
    }
    vm->mCounters.rxRunning = false;
    vm->mRxEnded = true;
    return nullptr;
}

void* VtspManager::cmdHandleFunc(void* arg) {
    auto* vm = static_cast<VtspManager*>(arg);
    __android_log_print(ANDROID_LOG_DEBUG, kTag, "%s: cmdHandleFunc: E", "cmdHandleFunc");
    nameThread("tVtspCmdHd");

    while (vm->mRxRunning) {
        std::shared_ptr<CmdBuffer> cmd;
        if (!vm->mRxQueue.waitAndPop(cmd)) {
            __android_log_print(ANDROID_LOG_INFO, kTag, "%s: cmdHandleFunc: Rx queue is stop",
                                "cmdHandleFunc");
            continue;
        }
        cmd->translate(true);
        cmd->print();
        CmdBuffer* reply = vm->parse(cmd);
        CommandHistory::ReplyText answer;
        CommandHistory::describeReply(reply, answer);
        bool refused = false;
        if (reply != nullptr) {
            std::shared_ptr<CmdBuffer> owned(reply);
            owned->translate(false);
            refused = !vm->mTxQueue.pushAndSignal(owned);
            if (refused) ++vm->mCounters.repliesRefused;
        }
        vm->mHistory.record(*cmd, CmdCallbackMvd::commandStreamId(cmd->command()), answer, refused);
    }
    vm->mCounters.handleRunning = false;
    return nullptr;
}

void* VtspManager::cmdTxFunc(void* arg) {
    auto* vm = static_cast<VtspManager*>(arg);
    __android_log_print(ANDROID_LOG_DEBUG, kTag, "%s: cmdTxFunc: E", "cmdTxFunc");
    installSigusr1Handler();
    acceptSigusr1();
    nameThread("tVtspCmdTx");

    // The modem still waits for the rest of a record the last link run cut short.
    if (vm->mTxRunning) vm->finishUnsentRecord();
    while (vm->mTxRunning) {
        std::shared_ptr<CmdBuffer> reply;
        if (!vm->mTxQueue.waitAndPop(reply)) {
            __android_log_print(ANDROID_LOG_INFO, kTag, "%s: cmdTxFunc: Tx queue is stop",
                                "cmdTxFunc");
            continue;
        }
        VPR_Comm record{};
        reply->compose(&record);
        __android_log_print(ANDROID_LOG_DEBUG, kTag, "%s, write Data to VPR", "cmdTxFunc");
        if (writeToVpr(vm, reinterpret_cast<const unsigned char*>(&record), kRecordSize) == kRecordSize) {
            ++vm->mCounters.recordsWritten;
        }
    }
    vm->mCounters.txRunning = false;
    vm->mTxEnded = true;
    return nullptr;
}

int VtspManager::readFromVpr(VtspManager* vm, unsigned char* buf, int /*len*/) {
    int done = 0;
    while (done < kRecordSize) {
        const ssize_t n = read(vm->mFd, buf + done, kRecordSize - done);
        if (n > 0) {
            done += static_cast<int>(n);
            vm->mCounters.bytesRead += static_cast<uint64_t>(n);
            continue;
        }
        const int err = errno;
        if (!vm->mRxRunning) return done;
        ++vm->mCounters.retries;
        if (n < 0 && err == EINTR) continue;
        ++vm->mCounters.readFailures;
        vm->mCounters.lastReadErrno = n == 0 ? 0 : err;
        // End of file is treated like an error: the modem side has gone away
        // for now, and repeating the read at once would spin.
        __android_log_print(ANDROID_LOG_ERROR, kTag, "%s: cmdRxFunc: failed to read file, error %s",
                            "readFromVpr", failureText(n, err));
        sleep(kDeviceRetrySeconds);
    }
    return kRecordSize;
}

int VtspManager::writeToVpr(VtspManager* vm, const unsigned char* buf, int len) {
    // Bytes of another record in between would misalign the modem for good.
    if (!vm->finishUnsentRecord()) return 0;
    const int done = vm->writeFrom(buf, 0);
    if (done == kRecordSize) return len;
    if (done > 0) {
        memcpy(&vm->mUnsent, buf, sizeof(vm->mUnsent));
        vm->mUnsentFrom = done;
        __android_log_print(ANDROID_LOG_ERROR, kTag,
                            "%s: %s took %d of %d bytes before the link stopped, the rest goes out first "
                            "when it runs again",
                            "writeToVpr", vm->mDevName, done, kRecordSize);
    }
    return done;
}

bool VtspManager::finishUnsentRecord() {
    if (mUnsentFrom == 0) return true;
    mUnsentFrom = writeFrom(reinterpret_cast<const unsigned char*>(&mUnsent), mUnsentFrom);
    if (mUnsentFrom < kRecordSize) return false;
    mUnsentFrom = 0;
    __android_log_print(ANDROID_LOG_INFO, kTag, "%s: rest of the unfinished record written to %s",
                        "writeToVpr", mDevName);
    return true;
}

int VtspManager::writeFrom(const unsigned char* record, int from) {
    int done = from;
    bool stopping = false;
    Clock::time_point stopSeen;
    while (done < kRecordSize) {
        const ssize_t n = write(mFd, record + done, kRecordSize - done);
        if (n > 0) {
            done += static_cast<int>(n);
            mCounters.bytesWritten += static_cast<uint64_t>(n);
            continue;
        }
        const int err = errno;
        const bool interrupted = n < 0 && err == EINTR;
        if (mRxRunning) {
            ++mCounters.retries;
            if (interrupted) continue;
            ++mCounters.writeFailures;
            mCounters.lastWriteErrno = n == 0 ? 0 : err;
            __android_log_print(ANDROID_LOG_ERROR, kTag, "Failed to write data to %s, err: %s", mDevName,
                                failureText(n, err));
            sleep(kDeviceRetrySeconds);
            continue;
        }
        // Stopping: a record not begun is dropped whole; one that has begun
        // is finished if the device takes the rest in time.
        if (done == 0) return 0;
        if (!stopping) {
            stopping = true;
            stopSeen = Clock::now();
        }
        if (Clock::now() - stopSeen >= kFinishRecordAfterStop) return done;
        if (!interrupted) usleep(kStoppedRetryMicros);
    }
    return done;
}

}  // namespace android
