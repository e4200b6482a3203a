#include "VtspManager.h"

#include <android/log.h>
#include <fcntl.h>
#include <signal.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "ModemPipe.h"

namespace android {

namespace {

constexpr const char* kTag = "VTSPManager";
constexpr int kRecordSize = static_cast<int>(kVprCommSize);
constexpr unsigned int kDeviceRetrySeconds = 2;
// How often destroy() repeats SIGUSR1 while a device thread has not ended: a
// signal that lands between the thread's flag test and its read is lost.
constexpr useconds_t kResignalMicros = 5000;
// A record half written when the link is told to stop is finished, but a
// device that never takes the rest must not hold destroy() forever.
constexpr int kMaxWriteRetriesAfterStop = 200;

void installSigusr1Handler() {
    struct sigaction action {};
    action.sa_handler = fakeHandler;
    sigemptyset(&action.sa_mask);
    action.sa_flags = 0;  // no SA_RESTART: a blocked read or write must fail with EINTR
    sigaction(SIGUSR1, &action, nullptr);
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

bool VtspManager::init() {
    if (mFd == -1) mFd = open(mDevName, O_RDWR);
    mRxRunning = true;
    mTxRunning = true;
    mRxQueue.start();
    mTxQueue.start();
    // destroy() may signal a device thread before it has installed the
    // handler itself, and SIGUSR1's default action ends the process.
    installSigusr1Handler();
    if (mRxThread == 0) {
        mRxEnded = false;
        if (pthread_create(&mRxThread, nullptr, cmdRxFunc, this) != 0) mRxThread = 0;
    }
    if (mTxThread == 0) {
        mTxEnded = false;
        if (pthread_create(&mTxThread, nullptr, cmdTxFunc, this) != 0) mTxThread = 0;
    }
    if (mHandleThread == 0) {
        if (pthread_create(&mHandleThread, nullptr, cmdHandleFunc, this) != 0) mHandleThread = 0;
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

void VtspManager::joinThread(pthread_t& thread, std::atomic<bool>* ended) {
    if (thread == 0) return;
    if (ended != nullptr) {
        while (!ended->load()) {
            pthread_kill(thread, SIGUSR1);
            usleep(kResignalMicros);
        }
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
    joinThread(mRxThread, &mRxEnded);
    joinThread(mTxThread, &mTxEnded);
    joinThread(mHandleThread, nullptr);
    if (mFd != -1) {
        close(mFd);
        mFd = -1;
    }
}

CmdBuffer* VtspManager::parse(std::shared_ptr<CmdBuffer> cmd) {
    return mCmdCallback->parse(*cmd);
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
    nameThread("tVtspCmdRx");

    int count = 0;
    while (vm->mRxRunning) {
        if (readFromVpr(vm, reinterpret_cast<unsigned char*>(record.get()), kRecordSize) <
            kRecordSize) {
            continue;
        }
        ++count;
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
        vm->mRxQueue.pushAndSignal(CmdBuffer::fromRecord(*record));
        vm->mRxQueue.waitForRoom(kRxHighWater, kRxLowWater);
    }
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
        if (reply != nullptr) {
            std::shared_ptr<CmdBuffer> owned(reply);
            owned->translate(false);
            vm->mTxQueue.pushAndSignal(owned);
        }
    }
    return nullptr;
}

void* VtspManager::cmdTxFunc(void* arg) {
    auto* vm = static_cast<VtspManager*>(arg);
    __android_log_print(ANDROID_LOG_DEBUG, kTag, "%s: cmdTxFunc: E", "cmdTxFunc");
    installSigusr1Handler();
    nameThread("tVtspCmdTx");

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
        writeToVpr(vm, reinterpret_cast<const unsigned char*>(&record), kRecordSize);
    }
    vm->mTxEnded = true;
    return nullptr;
}

int VtspManager::readFromVpr(VtspManager* vm, unsigned char* buf, int /*len*/) {
    int done = 0;
    while (done < kRecordSize) {
        const ssize_t n = read(vm->mFd, buf + done, kRecordSize - done);
        if (n > 0) {
            done += static_cast<int>(n);
            continue;
        }
        const int err = errno;
        if (!vm->mRxRunning) return done;
        if (n < 0 && err == EINTR) continue;
        // End of file is treated like an error: the modem side has gone away
        // for now, and repeating the read at once would spin.
        __android_log_print(ANDROID_LOG_ERROR, kTag, "%s: cmdRxFunc: failed to read file, error %s",
                            "readFromVpr", failureText(n, err));
        sleep(kDeviceRetrySeconds);
    }
    return kRecordSize;
}

int VtspManager::writeToVpr(VtspManager* vm, const unsigned char* buf, int len) {
    int done = 0;
    int retriesAfterStop = 0;
    while (done < kRecordSize) {
        const ssize_t n = write(vm->mFd, buf + done, kRecordSize - done);
        if (n > 0) {
            done += static_cast<int>(n);
            continue;
        }
        const int err = errno;
        if (vm->mRxRunning) {
            if (n < 0 && err == EINTR) continue;
            __android_log_print(ANDROID_LOG_ERROR, kTag, "Failed to write data to %s, err: %s",
                                vm->mDevName, failureText(n, err));
            sleep(kDeviceRetrySeconds);
            continue;
        }
        if (done == 0) return 0;
        if (++retriesAfterStop > kMaxWriteRetriesAfterStop) return done;
    }
    return len;
}

}  // namespace android
