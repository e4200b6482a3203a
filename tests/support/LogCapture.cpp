#include "LogCapture.h"

#include <android/log.h>

#include <condition_variable>
#include <mutex>

namespace {

std::mutex gMutex;
std::condition_variable gCond;
std::vector<LogLine> gLines;
bool gHoldArmed = false;
bool gHolding = false;
LogLine gHoldLine;

void captureLogger(const struct __android_logger_data* data, const char* message) {
    std::unique_lock<std::mutex> lock(gMutex);
    gLines.push_back(LogLine{data->priority, data->tag != nullptr ? data->tag : "", message,
                             std::chrono::steady_clock::now()});
    gCond.notify_all();
    if (gHoldArmed && gLines.back() == gHoldLine) {
        gHoldArmed = false;
        gHolding = true;
        gCond.wait(lock, [] { return !gHolding; });
    }
}

size_t countLocked(int priority, const std::string& tag, const std::string& text) {
    size_t n = 0;
    for (const LogLine& line : gLines) {
        if (line.priority == priority && line.tag == tag && line.text == text) ++n;
    }
    return n;
}

}  // namespace

LogCapture::LogCapture() {
    clear();
    __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
    __android_log_set_logger(captureLogger);
}

LogCapture::~LogCapture() {
    letGo();
    __android_log_set_logger(__android_log_stderr_logger);
    __android_log_set_minimum_priority(ANDROID_LOG_INFO);
}

std::vector<LogLine> LogCapture::lines() const {
    std::lock_guard<std::mutex> lock(gMutex);
    return gLines;
}

std::vector<LogLine> LogCapture::linesWithTag(const std::string& tag) const {
    std::vector<LogLine> out;
    for (const LogLine& line : lines()) {
        if (line.tag == tag) out.push_back(line);
    }
    return out;
}

size_t LogCapture::count(int priority, const std::string& tag, const std::string& text) const {
    std::lock_guard<std::mutex> lock(gMutex);
    return countLocked(priority, tag, text);
}

std::chrono::milliseconds LogCapture::firstGap(int priority, const std::string& tag,
                                               const std::string& text) const {
    std::vector<std::chrono::steady_clock::time_point> at;
    for (const LogLine& line : lines()) {
        if (line.priority == priority && line.tag == tag && line.text == text) at.push_back(line.when);
    }
    if (at.size() < 2) return std::chrono::milliseconds(-1);
    return std::chrono::duration_cast<std::chrono::milliseconds>(at[1] - at[0]);
}

bool LogCapture::waitFor(int priority, const std::string& tag, const std::string& text,
                         size_t times, std::chrono::milliseconds timeout) const {
    std::unique_lock<std::mutex> lock(gMutex);
    return gCond.wait_for(lock, timeout,
                          [&] { return countLocked(priority, tag, text) >= times; });
}

void LogCapture::clear() {
    std::lock_guard<std::mutex> lock(gMutex);
    gLines.clear();
}

void LogCapture::holdAt(int priority, const std::string& tag, const std::string& text) {
    std::lock_guard<std::mutex> lock(gMutex);
    gHoldLine = LogLine{priority, tag, text, {}};
    gHoldArmed = true;
}

void LogCapture::letGo() {
    std::lock_guard<std::mutex> lock(gMutex);
    gHoldArmed = false;
    gHolding = false;
    gCond.notify_all();
}
