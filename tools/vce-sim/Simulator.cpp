#include "Simulator.h"

#include <binder/IServiceManager.h>
#include <utils/String16.h>

#include <chrono>
#include <sstream>
#include <thread>
#include <tuple>

#include "HostBinder.h"
#include "HostFakes.h"
#include "RecordDecoder.h"
#include "TokenCursor.h"
#include "VideoCallEngineService.h"
#include "VtspManager.h"
#include "VtspRecord.h"

using Actor = ScenarioStep::Actor;
using Kind = TimelineEntry::Kind;

namespace {

// The system has settled when nothing new has happened for this long.
constexpr auto kQuiet = std::chrono::milliseconds(50);
constexpr auto kSettleLimit = std::chrono::seconds(3);
constexpr size_t kShownOnFailure = 12;

std::string libraryOf(const std::string& call) {
    if (call.compare(0, 6, "camdrv") == 0) return "camera";
    if (call.compare(0, 6, "render") == 0) return "render";
    if (call.compare(0, 4, "Zmf_") == 0) return "zmf";
    return "media";
}

template <typename T, typename Text>
std::string listed(const std::vector<T>& items, Text text) {
    if (items.empty()) return " (none)";
    std::string out;
    for (size_t i = 0; i < items.size() && i < kShownOnFailure; ++i) out += "\n      " + text(items[i]);
    if (items.size() > kShownOnFailure) out += "\n      ... " + std::to_string(items.size() - kShownOnFailure) + " more";
    return out;
}

}  // namespace

Simulator::Simulator(const Options& options, std::ostream& out)
    : mLog(&mTimeline),
      mModem(&mTimeline),
      mAnnounced(announce()),
      mMedia(&mTimeline),
      mServiceRegistered(startService()),
      mClient(&mTimeline),
      mPrinter(out, options.verbose, options.colour),
      mInvariants(options.invariants),
      mVerbose(options.verbose) {
    harvestCalls(Actor::kClient);
    mPrinter.print(mTimeline.takeNew());
}

Simulator::~Simulator() {
    settle();
    // The link reads the pseudo-terminal that mModem owns: stop it first.
    android::VtspManager::getInstance()->destroy();
}

bool Simulator::announce() {
    note(Kind::kHeading, "", std::string("start-up: link on ") + mModem.devicePath() + " (standing in for " +
                                     android::kModemPipePath + ")");
    return true;
}

bool Simulator::startService() {
    TimelineEntry entry;
    entry.actor = "host";
    entry.target = "service";
    entry.text = "VideoCallEngineService::instantiate()";
    mTimeline.add(entry);
    const android::status_t status = android::VideoCallEngineService::instantiate();
    note(Kind::kEvent, "host", "<- " + std::to_string(status));
    return status == android::NO_ERROR;
}

void Simulator::note(Kind kind, const std::string& actor, const std::string& text) {
    TimelineEntry entry;
    entry.kind = kind;
    entry.actor = actor;
    entry.text = text;
    mTimeline.add(entry);
}

std::vector<std::string> Simulator::play(const Scenario& scenario) {
    std::vector<std::string> failures;
    if (!mServiceRegistered || !mClient.valid()) {
        failures.push_back("the service could not be registered; nothing was played");
        return failures;
    }
    for (const ScenarioStep& step : scenario.steps()) {
        if (step.actor == Actor::kExpect) {
            const std::string found = check(step);
            note(found.empty() ? Kind::kExpectOk : Kind::kExpectFailed, "expect",
                 (found.empty() ? "ok      " : "FAILED  ") + TokenCursor(step.source).restAfterFirst());
            if (!found.empty()) failures.push_back("line " + std::to_string(step.line) + ": " + step.source + ": " + found);
        } else {
            const std::string violated = this->step(step);
            if (!violated.empty()) {
                note(Kind::kExpectFailed, "check", "FAILED  " + violated);
                failures.push_back("line " + std::to_string(step.line) + ": " + step.source + ": " + violated);
                mPrinter.print(mTimeline.takeNew());
                break;
            }
        }
        mPrinter.print(mTimeline.takeNew());
    }
    settle();
    harvestCalls(Actor::kClient);
    if (mVerbose) {
        note(Kind::kHeading, "", "the service's state at the end");
        dump("");
    }
    mPrinter.print(mTimeline.takeNew());
    return failures;
}

void Simulator::dump(const std::string& args) {
    std::vector<std::string> words;
    std::istringstream in(args);
    for (std::string word; in >> word;) words.push_back(word);
    TimelineEntry entry;
    entry.actor = "shell";
    entry.target = "service";
    entry.text = "dumpsys VideoCallEngineService" + (args.empty() ? "" : " " + args);
    mTimeline.add(entry);
    const android::sp<android::IBinder> service = android::defaultServiceManager()->checkService(
            android::String16(android::VideoCallEngineService::kServiceName));
    android::status_t status = android::NAME_NOT_FOUND;
    mLastDump = service != nullptr ? hostbinder::dumpsys(service, words, &status) : "";
    std::istringstream lines(mLastDump);
    for (std::string line; std::getline(lines, line);) note(Kind::kEvent, "shell", "| " + line);
    if (status != android::NO_ERROR) note(Kind::kEvent, "shell", "<- status " + std::to_string(status));
}

void Simulator::run(const ScenarioStep& step) {
    if (step.actor == Actor::kHeading) {
        note(Kind::kHeading, "", step.text);
        return;
    }
    mMarks = Marks{hostfakes::callCount(), mLog.lineCount(), mModem.recordCount(), mClient.eventCount(), step.line};
    switch (step.actor) {
        case Actor::kClient: mClient.perform(step); break;
        case Actor::kModem: mModem.send(step.modem); break;
        case Actor::kMedia: mMedia.perform(step); break;
        case Actor::kDump: dump(step.text); break;
        case Actor::kLink: runLink(step); break;
        case Actor::kWait:
            note(Kind::kStep, "wait", std::to_string(step.ints[0]) + " ms");
            std::this_thread::sleep_for(std::chrono::milliseconds(step.ints[0]));
            break;
        default: break;
    }
    settle();
    harvestCalls(step.actor);
}

std::string Simulator::step(const ScenarioStep& step) {
    mStartFoundStream = step.actor == Actor::kModem && step.modem.kind == StepSyntax::Kind::kStart &&
                        android::VtspManager::getInstance()->mCmdCallback->snapshot(step.modem.stream.streamId).has_value();
    // The client's death reaches the engine only through the death link of
    // a callback it still has registered.
    mDeathEndsCall = step.actor == Actor::kClient && step.verb == "die" && mClient.hasCallback();
    run(step);
    return mInvariants ? checkInvariants(step) : "";
}

void Simulator::perform(const ScenarioStep& step) {
    const int actor = step.actor == Actor::kClient ? 0 : step.actor == Actor::kModem ? 1 : step.actor == Actor::kMedia ? 2 : 3;
    std::lock_guard<std::mutex> lock(mActorLocks[actor]);
    switch (step.actor) {
        case Actor::kClient: mClient.perform(step); break;
        case Actor::kModem: mModem.send(step.modem); break;
        case Actor::kMedia: mMedia.perform(step); break;
        case Actor::kLink: runLink(step); break;
        case Actor::kDump: dump(step.text); break;
        default: break;
    }
}

void Simulator::runLink(const ScenarioStep& step) {
    android::VtspManager* link = android::VtspManager::getInstance();
    if (step.verb == "stall") {
        note(Kind::kStep, "modem", "stops reading the pipe for " + std::to_string(step.ints[0]) + " ms");
        mModem.stall(step.ints[0]);
        return;
    }
    note(Kind::kStep, "host", "VtspManager::" + step.verb + "()");
    if (step.verb == "stop") {
        link->stop();
        mLinkStopped = true;
    } else if (step.verb == "start") {
        link->start();
        mLinkStopped = false;
    } else {
        link->destroy();
        link->init();
        mLinkStopped = false;
    }
}

void Simulator::settle() {
    auto snapshot = [this] {
        return std::make_tuple(hostfakes::callCount(), mLog.lineCount(), mModem.recordCount(), mClient.eventCount());
    };
    const auto deadline = std::chrono::steady_clock::now() + kSettleLimit;
    auto last = snapshot();
    auto quietSince = std::chrono::steady_clock::now();
    while (std::chrono::steady_clock::now() < deadline) {
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
        const auto now = snapshot();
        if (now != last) {
            last = now;
            quietSince = std::chrono::steady_clock::now();
        } else if (std::chrono::steady_clock::now() - quietSince >= kQuiet) {
            return;
        }
    }
}

void Simulator::harvestCalls(Actor actor) {
    const std::vector<hostfakes::Call> calls = hostfakes::calls();
    for (; mHarvested < calls.size(); ++mHarvested) {
        const hostfakes::Call& call = calls[mHarvested];
        const std::string library = libraryOf(call.name);
        // Stream control lives in the link; everything else is the engine's.
        const bool fromLink = actor == Actor::kModem && library == "media";
        mTimeline.addCall(mHarvested, library, call.text(), fromLink ? "link" : "vce", "media");
    }
}

std::string Simulator::check(const ScenarioStep& step) const {
    if (step.verb == "call") return checkCall(step, true);
    if (step.verb == "no-call") return checkCall(step, false);
    if (step.verb == "event") return checkEvent(step, true);
    if (step.verb == "no-event") return checkEvent(step, false);
    if (step.verb == "bind") return checkBind(step);
    if (step.verb == "log") return checkLog(step);
    if (step.verb == "dump" && mLastDump.find(step.text) == std::string::npos) {
        return mLastDump.empty() ? "no dump was taken before it" : "not in the last dump";
    }
    if (step.verb == "reply" && mClient.lastReply() != step.ints[0]) {
        return "the reply was " + std::to_string(mClient.lastReply());
    }
    return "";
}

std::string Simulator::checkCall(const ScenarioStep& step, bool wanted) const {
    const std::vector<std::string> texts = hostfakes::callTextsSince(mMarks.calls);
    std::vector<std::string> matching;
    for (const std::string& text : texts) {
        if (text.find(step.text) != std::string::npos) matching.push_back(text);
    }
    auto same = [](const std::string& s) { return s; };
    if (wanted && matching.empty()) return "no such call since line " + std::to_string(mMarks.line) + "; calls:" + listed(texts, same);
    if (!wanted && !matching.empty()) return "called:" + listed(matching, same);
    return "";
}

std::string Simulator::checkEvent(const ScenarioStep& step, bool wanted) const {
    const std::vector<ImsClient::Event> events = mClient.eventsSince(mMarks.events);
    bool found = false;
    for (const ImsClient::Event& e : events) {
        const bool valuesMatch = step.ints.size() == 1 ||
                                 e.values == std::vector<int32_t>(step.ints.begin() + 1, step.ints.end());
        found = found || (e.event == step.ints[0] && valuesMatch);
    }
    if (found == wanted) return "";
    auto text = [](const ImsClient::Event& e) {
        std::string out = "event " + std::to_string(e.event);
        for (int32_t v : e.values) out += " " + std::to_string(v);
        return out;
    };
    return std::string(wanted ? "not received" : "received") + " since line " + std::to_string(mMarks.line) +
           "; events:" + listed(events, text);
}

std::string Simulator::checkBind(const ScenarioStep& step) const {
    const std::vector<android::VPR_Comm> records = mModem.recordsSince(mMarks.records);
    for (const android::VPR_Comm& record : records) {
        const vtspcodec::BindRequest bind = vtspcodec::readBindRequest(record);
        if (bind.targetModule != android::VPMD_NET_TARGET || bind.code != android::VPR_NET_CMD_BIND ||
            bind.streamId != static_cast<int32_t>(step.modem.stream.streamId)) {
            continue;
        }
        if (!step.hasLocal ||
            vtspcodec::endpointText(bind.addr) == vtspcodec::endpointText(step.modem.stream.localAddr)) {
            return "";
        }
    }
    return "no such record since line " + std::to_string(mMarks.line) + "; records from the link:" +
           listed(records, [](const android::VPR_Comm& r) { return RecordDecoder::summary(r); });
}

std::string Simulator::checkLog(const ScenarioStep& step) const {
    for (const std::string& line : mLog.linesSince(mMarks.logs)) {
        if (line.find(step.text) != std::string::npos) return "";
    }
    return "not logged since line " + std::to_string(mMarks.line) + " (run with -v to see the log)";
}
