#include "LogTap.h"

#include <android/log.h>

#include <atomic>

namespace {

// liblog's logger hook takes a plain function, so the live tap is found here.
std::atomic<LogTap*> gTap{nullptr};

char priorityLetter(int priority) {
    static const char kLetters[] = "??VDIWEF";
    return priority >= 0 && priority < 8 ? kLetters[priority] : '?';
}

}  // namespace

LogTap::LogTap(Timeline* timeline) : mTimeline(timeline) {
    gTap.store(this);
    __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
    __android_log_set_logger(&LogTap::logger);
}

LogTap::~LogTap() {
    __android_log_set_logger(__android_log_stderr_logger);
    __android_log_set_minimum_priority(ANDROID_LOG_INFO);
    gTap.store(nullptr);
}

void LogTap::logger(const struct __android_logger_data* data, const char* message) {
    LogTap* tap = gTap.load();
    if (tap != nullptr) tap->take(data->priority, data->tag, message);
}

void LogTap::take(int priority, const char* tag, const char* message) {
    const std::string line = std::string(1, priorityLetter(priority)) + " " + (tag != nullptr ? tag : "") + ": " +
                             (message != nullptr ? message : "");
    {
        std::lock_guard<std::mutex> lock(mLock);
        mLines.push_back(line);
    }
    TimelineEntry entry;
    entry.kind = TimelineEntry::Kind::kLog;
    entry.actor = "log";
    entry.text = line;
    mTimeline->add(entry);
}

std::vector<std::string> LogTap::linesSince(size_t from) const {
    std::lock_guard<std::mutex> lock(mLock);
    if (from >= mLines.size()) return {};
    return std::vector<std::string>(mLines.begin() + static_cast<std::ptrdiff_t>(from), mLines.end());
}

size_t LogTap::lineCount() const {
    std::lock_guard<std::mutex> lock(mLock);
    return mLines.size();
}
