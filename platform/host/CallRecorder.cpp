#include "CallRecorder.h"

#include <cstdlib>
#include <cstring>
#include <thread>

namespace hostfakes {

std::string argText(long long value) {
    return std::to_string(value);
}

std::string argText(const char* text) {
    if (text == nullptr) return "NULL";
    // Keeps trace lines readable when a caller passes a very long text.
    constexpr size_t kShown = 200;
    const size_t length = strlen(text);
    std::string out = "\"";
    for (const char* p = text; *p != '\0' && p < text + kShown; ++p) {
        const unsigned char c = static_cast<unsigned char>(*p);
        if (c == '"' || c == '\\') {
            out += '\\';
            out += static_cast<char>(c);
        } else if (c < 0x20 || c >= 0x7f) {
            char esc[8];
            snprintf(esc, sizeof(esc), "\\x%02x", c);
            out += esc;
        } else {
            out += static_cast<char>(c);
        }
    }
    out += "\"";
    if (length > kShown) out += "...(" + std::to_string(length) + " bytes)";
    return out;
}

std::string outText(long long value) {
    return "out=" + std::to_string(value);
}

std::string codecText(const tagMVD_CODEC* codec) {
    if (codec == nullptr) return "NULL";
    char text[128];
    snprintf(text, sizeof(text), "{pt=%d br=%d fps=%d %dx%d}",
             codec->aiWord[MVD_CODEC_WORD_PAYLOAD], codec->aiWord[MVD_CODEC_WORD_BITRATE],
             codec->aiWord[MVD_CODEC_WORD_FRAMERATE], codec->aiWord[MVD_CODEC_WORD_WIDTH],
             codec->aiWord[MVD_CODEC_WORD_HEIGHT]);
    return text;
}

int recordCall(const std::string& function, std::vector<std::string> args, int natural) {
    CallRecorder& r = CallRecorder::instance();
    return r.record(function, std::move(args), r.resultFor(function, natural));
}

int runOnEngineThread(const std::function<int()>& fn) {
    int result = 0;
    std::thread thread([&] { result = fn(); });
    thread.join();
    return result;
}

std::string Call::text() const {
    std::string out = name + "(";
    for (size_t i = 0; i < args.size(); ++i) {
        if (i != 0) out += ", ";
        out += args[i];
    }
    return out + ") = " + std::to_string(result);
}

CallRecorder& CallRecorder::instance() {
    // Never destroyed: fakes may be called from threads that outlive static
    // destruction at process exit.
    static CallRecorder* recorder = new CallRecorder();
    return *recorder;
}

CallRecorder::CallRecorder() {
    setTrace(getenv("QUELLBORN_TRACE"));
}

CallRecorder::~CallRecorder() {
    closeTraceLocked();
}

int CallRecorder::resultFor(const std::string& function, int natural) {
    std::unique_lock<std::mutex> lock(mMutex);
    mReleased.wait(lock, [&] { return mHeld.empty() || mHeld != function; });
    const auto it = mResults.find(function);
    return it == mResults.end() ? natural : it->second;
}

int CallRecorder::record(const std::string& function, std::vector<std::string> args, int result) {
    std::lock_guard<std::mutex> lock(mMutex);
    ++mSeq;
    if (!mKeep && mTrace == nullptr) return result;
    Call call{function, std::move(args), result};
    if (mTrace != nullptr) {
        fprintf(mTrace, "qb-trace %lu %s\n", mSeq, call.text().c_str());
        fflush(mTrace);
    }
    if (mKeep) mCalls.push_back(std::move(call));
    return result;
}

void CallRecorder::reset() {
    std::vector<std::function<void()>> hooks;
    {
        std::lock_guard<std::mutex> lock(mMutex);
        mCalls.clear();
        mResults.clear();
        mHeld.clear();
        hooks = mResetHooks;
    }
    mReleased.notify_all();
    for (auto& hook : hooks) hook();
}

std::vector<Call> CallRecorder::calls() {
    std::lock_guard<std::mutex> lock(mMutex);
    return mCalls;
}

void CallRecorder::setResult(const std::string& function, int result) {
    std::lock_guard<std::mutex> lock(mMutex);
    mResults[function] = result;
}

void CallRecorder::clearResult(const std::string& function) {
    std::lock_guard<std::mutex> lock(mMutex);
    mResults.erase(function);
}

void CallRecorder::holdCalls(const std::string& function) {
    std::lock_guard<std::mutex> lock(mMutex);
    mHeld = function;
}

void CallRecorder::releaseCalls() {
    {
        std::lock_guard<std::mutex> lock(mMutex);
        mHeld.clear();
    }
    mReleased.notify_all();
}

void CallRecorder::setRecording(bool keep) {
    std::lock_guard<std::mutex> lock(mMutex);
    mKeep = keep;
}

void CallRecorder::addResetHook(std::function<void()> hook) {
    std::lock_guard<std::mutex> lock(mMutex);
    mResetHooks.push_back(std::move(hook));
}

void CallRecorder::closeTraceLocked() {
    if (mOwnsTrace && mTrace != nullptr) fclose(mTrace);
    mTrace = nullptr;
    mOwnsTrace = false;
}

void CallRecorder::setTrace(const char* target) {
    std::lock_guard<std::mutex> lock(mMutex);
    closeTraceLocked();
    if (target == nullptr || *target == '\0') return;
    if (strcmp(target, "stderr") == 0) {
        mTrace = stderr;
    } else if (strcmp(target, "stdout") == 0) {
        mTrace = stdout;
    } else {
        mTrace = fopen(target, "a");
        mOwnsTrace = mTrace != nullptr;
        if (mTrace == nullptr) fprintf(stderr, "qb-trace: cannot open %s\n", target);
    }
}

// Control API.

void reset() { CallRecorder::instance().reset(); }
std::vector<Call> calls() { return CallRecorder::instance().calls(); }

std::vector<std::string> callTexts() { return callTextsSince(0); }

std::vector<std::string> callTextsSince(size_t from) {
    std::vector<std::string> out;
    const std::vector<Call> all = calls();
    for (size_t i = from; i < all.size(); ++i) out.push_back(all[i].text());
    return out;
}

std::vector<std::string> callNames() {
    std::vector<std::string> out;
    for (const Call& call : calls()) out.push_back(call.name);
    return out;
}

size_t callCount() { return calls().size(); }

size_t callCount(const std::string& function) {
    size_t n = 0;
    for (const Call& call : calls()) n += call.name == function;
    return n;
}

void setResult(const std::string& function, int result) {
    CallRecorder::instance().setResult(function, result);
}
void clearResult(const std::string& function) { CallRecorder::instance().clearResult(function); }
void holdCalls(const std::string& function) { CallRecorder::instance().holdCalls(function); }
void releaseCalls() { CallRecorder::instance().releaseCalls(); }
void setTrace(const char* target) { CallRecorder::instance().setTrace(target); }
void setRecording(bool keep) { CallRecorder::instance().setRecording(keep); }

}  // namespace hostfakes
