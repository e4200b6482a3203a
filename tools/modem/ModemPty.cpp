#include "ModemPty.h"

#include <fcntl.h>
#include <poll.h>
#include <termios.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <stdexcept>
#include <thread>

ModemPty::ModemPty() {
    mMaster = posix_openpt(O_RDWR | O_NOCTTY);
    if (mMaster < 0 || grantpt(mMaster) != 0 || unlockpt(mMaster) != 0) {
        throw std::runtime_error("cannot create a pseudo-terminal");
    }
    mSlaveName = ptsname(mMaster);
    // Raw mode: bytes pass unchanged in both directions, no echo, no line
    // editing, reads return as soon as a byte is there. Keeping a slave
    // descriptor open also keeps the master readable while the system has
    // its own descriptor closed.
    mSlaveKeepAlive = open(mSlaveName.c_str(), O_RDWR | O_NOCTTY);
    struct termios tio {};
    tcgetattr(mSlaveKeepAlive, &tio);
    cfmakeraw(&tio);
    tcsetattr(mSlaveKeepAlive, TCSANOW, &tio);
}

ModemPty::~ModemPty() {
    closeMaster();
    if (mSlaveKeepAlive >= 0) close(mSlaveKeepAlive);
}

void ModemPty::closeMaster() {
    if (mMaster >= 0) close(mMaster);
    mMaster = -1;
}

void ModemPty::writeBytes(const void* data, size_t size) {
    const char* p = static_cast<const char*>(data);
    while (size > 0) {
        const ssize_t n = write(mMaster, p, size);
        if (n < 0) {
            if (errno == EINTR) continue;
            throw std::runtime_error("write to pseudo-terminal failed");
        }
        p += n;
        size -= static_cast<size_t>(n);
    }
}

void ModemPty::writeRecord(const android::VPR_Comm& record, size_t chunk,
                           std::chrono::milliseconds pause) {
    const char* p = reinterpret_cast<const char*>(&record);
    size_t left = sizeof(record);
    while (left > 0) {
        const size_t n = left < chunk ? left : chunk;
        writeBytes(p, n);
        p += n;
        left -= n;
        if (left > 0 && pause.count() > 0) std::this_thread::sleep_for(pause);
    }
}

bool ModemPty::readRecord(android::VPR_Comm* out, std::chrono::milliseconds timeout) {
    char* p = reinterpret_cast<char*>(out);
    size_t got = 0;
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (got < sizeof(*out)) {
        const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
                deadline - std::chrono::steady_clock::now());
        if (left.count() <= 0) return false;
        struct pollfd pfd {mMaster, POLLIN, 0};
        const int ready = poll(&pfd, 1, static_cast<int>(left.count()));
        if (ready < 0 && errno == EINTR) continue;
        if (ready <= 0) return false;
        const ssize_t n = read(mMaster, p + got, sizeof(*out) - got);
        if (n < 0 && errno == EINTR) continue;
        if (n <= 0) return false;
        got += static_cast<size_t>(n);
    }
    return true;
}

bool ModemPty::silentFor(std::chrono::milliseconds window) {
    struct pollfd pfd {mMaster, POLLIN, 0};
    return poll(&pfd, 1, static_cast<int>(window.count())) == 0;
}
