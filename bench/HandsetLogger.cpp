#include "HandsetLogger.h"

#include <sys/socket.h>
#include <sys/uio.h>
#include <time.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

// The single writer the logger callback (a plain function) reaches.
std::atomic<int> sWriter{-1};

// What a device's liblog puts before the priority: log id, thread id, time.
struct __attribute__((packed)) LineHeader {
    uint8_t logId;
    uint16_t tid;
    uint32_t seconds;
    uint32_t nanoseconds;
};

}  // namespace

HandsetLogger::HandsetLogger(__android_logger_function previous) : mPrevious(previous) {
    int fds[2];
    if (socketpair(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0, fds) != 0) {
        perror("vtsp-bench: socketpair");
        exit(2);
    }
    mWriter = fds[0];
    mReader = fds[1];
    mDrainer = std::thread([this] { drain(); });
    sWriter = mWriter;
    __android_log_set_logger(log);
}

HandsetLogger::~HandsetLogger() {
    __android_log_set_logger(mPrevious);
    sWriter = -1;
    // An empty datagram, which no line ever is, tells the drainer to finish
    // once it has taken every line queued before it.
    while (send(mWriter, "", 0, 0) < 0 && errno == EINTR) {
    }
    mDrainer.join();
    close(mWriter);
    close(mReader);
}

void HandsetLogger::log(const struct __android_logger_data* data, const char* message) {
    const int fd = sWriter.load(std::memory_order_relaxed);
    if (fd < 0) return;
    struct timespec now {};
    clock_gettime(CLOCK_REALTIME, &now);
    LineHeader header{0, static_cast<uint16_t>(gettid()), static_cast<uint32_t>(now.tv_sec),
                      static_cast<uint32_t>(now.tv_nsec)};
    uint8_t priority = static_cast<uint8_t>(data->priority);
    const char* tag = data->tag != nullptr ? data->tag : "";
    struct iovec parts[4] = {{&header, sizeof(header)},
                             {&priority, 1},
                             {const_cast<char*>(tag), strlen(tag) + 1},
                             {const_cast<char*>(message), strlen(message) + 1}};
    while (writev(fd, parts, 4) < 0 && errno == EINTR) {
    }
}

void HandsetLogger::drain() {
    char line[5 * 1024];
    for (;;) {
        const ssize_t n = recv(mReader, line, sizeof(line), 0);
        if (n == 0 || (n < 0 && errno != EINTR)) break;
    }
}
