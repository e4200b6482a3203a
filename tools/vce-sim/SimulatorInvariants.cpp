// What must hold after every step of a call, whatever the steps were: the
// checks behind `vce-sim --invariants` and `--chaos`. Each compares the
// engine's own state with what the platform stand-ins saw happen, so a
// fault shows wherever the two part ways.
#include <algorithm>
#include <chrono>
#include <thread>
#include <set>

#include "HostFakes.h"
#include "Simulator.h"
#include "VideoCallEngineImpl.h"
#include "VtspManager.h"
#include "VtspRecord.h"

using Actor = ScenarioStep::Actor;

namespace {

constexpr auto kReplyGrace = std::chrono::seconds(3);

bool carriesLocalEnd(const StepSyntax::Step& start) {
    const android::OSAL_NetAddress& a = start.stream.localAddr;
    return a.type <= 3 && a.port != 0;
}

std::string violation(const std::string& name, const std::string& found) { return "invariant " + name + ": " + found; }

template <typename C>
std::string listText(const C& items) {
    std::string out;
    for (const auto& item : items) out += (out.empty() ? "" : ", ") + std::string(item);
    return "{" + out + "}";
}

}  // namespace

std::string Simulator::checkInvariants(const ScenarioStep& step) {
    std::string found = checkRecords(step);
    if (found.empty()) found = checkStreams();
    if (found.empty()) found = checkCallState(step);
    return found;
}

std::string Simulator::checkQuiet() {
    settle();
    harvestCalls(Actor::kClient);
    std::string found = checkFraming(mQuietRecords);
    mQuietRecords = mModem.recordCount();
    if (found.empty()) found = checkStreams();
    if (found.empty()) found = checkCallState(ScenarioStep());
    return found;
}

std::string Simulator::checkFraming(size_t from) const {
    // Every record from the link is one whole bind request.
    for (const android::VPR_Comm& record : mModem.recordsSince(from)) {
        const vtspcodec::BindRequest bind = vtspcodec::readBindRequest(record);
        if (bind.targetModule != android::VPMD_NET_TARGET || bind.code != android::VPR_NET_CMD_BIND ||
            bind.recordLength != android::kVprCommSize) {
            return violation("framing", "the link wrote a record that is not a whole bind request (target " +
                                                std::to_string(bind.targetModule) + ", code " + std::to_string(bind.code) +
                                                ", length " + std::to_string(bind.recordLength) + ")");
        }
    }
    return "";
}

std::string Simulator::checkRecords(const ScenarioStep& step) {
    const std::string framing = checkFraming(mMarks.records);
    if (!framing.empty()) return framing;
    if (step.actor == Actor::kLink && step.verb != "stall") {
        // Stopping or restarting the link drops the replies it had queued.
        mBindsFrom = mModem.recordCount();
        mBindsExpected = 0;
        return "";
    }
    const bool accepted = step.actor == Actor::kModem && step.modem.kind == StepSyntax::Kind::kStart &&
                          step.modem.type == 0 && !mLinkStopped;
    if (accepted && (carriesLocalEnd(step.modem) || mStartFoundStream)) ++mBindsExpected;
    if (mModem.stalled()) return "";
    // Settling ends after a quiet spell, and on a loaded machine the link's
    // threads can be kept off the CPU for longer than that: a reply still
    // missing gets the settle limit to arrive before it counts as lost.
    const auto deadline = std::chrono::steady_clock::now() + kReplyGrace;
    while (mModem.recordCount() - mBindsFrom < mBindsExpected && std::chrono::steady_clock::now() < deadline) {
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
    const size_t received = mModem.recordCount() - mBindsFrom;
    if (received == mBindsExpected) return "";
    return violation("bind", std::to_string(received) + " bind requests for " + std::to_string(mBindsExpected) +
                                     " starts that name or know their local end");
}

std::string Simulator::checkStreams() {
    // The media engine's open streams are the dispatcher's streams and the
    // engine's loopback stream: nothing leaks.
    std::set<unsigned int> held;
    for (const android::StreamSnapshot& s : android::VtspManager::getInstance()->mCmdCallback->snapshots()) {
        if (s.mvdStreamId != 0) held.insert(s.mvdStreamId);
    }
    const android::VideoCallEngineImpl* engine = android::VideoCallEngineImpl::getInstance();
    std::set<unsigned int> open;
    for (unsigned int id : hostfakes::openMvdStreams()) {
        // A loopback stream stays the engine's after init(0) ends the mode,
        // until release closes it.
        if (held.count(id) == 0 && static_cast<unsigned int>(engine->mLoopbackStream) != id) {
            return violation("streams", "media engine stream " + std::to_string(id) +
                                                " is open but no stream of the link or the engine holds it");
        }
        open.insert(id);
    }
    for (unsigned int id : held) {
        if (open.count(id) == 0) {
            return violation("streams", "a stream of the link holds media engine stream " + std::to_string(id) +
                                                ", which is not open");
        }
    }
    // A suspend of every stream lasts only as long as the operation that
    // asked for it.
    const std::vector<std::string> calls = hostfakes::callTextsSince(mSuspendScan);
    mSuspendScan += calls.size();
    for (const std::string& call : calls) {
        if (call.compare(0, 18, "Mvd_SuspendAllStrm") == 0) mSuspendedBy = call;
        if (call.compare(0, 17, "Mvd_ResumeAllStrm") == 0) mSuspendedBy.clear();
    }
    if (!mSuspendedBy.empty()) {
        return violation("suspend", "every media engine stream is left suspended (" + mSuspendedBy + ")");
    }
    return "";
}

std::string Simulator::checkCallState(const ScenarioStep& step) const {
    const android::VideoCallEngineImpl* engine = android::VideoCallEngineImpl::getInstance();
    // Renders the library shows are the renders the engine believes added.
    std::vector<std::string> believed;
    if (engine->mRemoteRenderStarted) believed.push_back(engine->mRemoteRenderId);
    if (engine->mLocalRenderStarted && engine->mOpenCameraId != -1) {
        believed.push_back(android::VideoCallEngineImpl::captureName(engine->mOpenCameraId));
    }
    std::sort(believed.begin(), believed.end());
    std::vector<std::string> active = hostfakes::activeRenders();
    std::sort(active.begin(), active.end());
    if (active != believed) {
        return violation("renders", "the render library shows " + listText(active) + ", the engine believes " +
                                            listText(believed));
    }
    // A camera is open exactly when the engine holds its handle.
    const std::vector<int> cameras = hostfakes::openCameras();
    const bool held = engine->mCaptureHandle != 0;
    if (cameras.size() != (held ? 1u : 0u) ||
        (held && cameras[0] != static_cast<int>(engine->mCaptureHandle))) {
        return violation("camera", std::to_string(cameras.size()) + " captures open, the engine holds handle " +
                                           std::to_string(engine->mCaptureHandle));
    }
    if (mClient.staleEvents() != 0) {
        return violation("callback", std::to_string(mClient.staleEvents()) +
                                             " events reached a callback that was no longer registered");
    }
    // After a release, or the client's death, nothing of the call is left.
    const bool ended = step.actor == Actor::kClient &&
                       (step.verb == "release" || (step.verb == "die" && mDeathEndsCall) ||
                        (step.verb == "send" && step.ints[0] == 8));
    if (ended) {
        const std::vector<unsigned int> open = hostfakes::openMvdStreams();
        const bool loopbackOpen = engine->mLoopbackStream != 0 &&
                                  std::count(open.begin(), open.end(),
                                             static_cast<unsigned int>(engine->mLoopbackStream)) != 0;
        if (held || !active.empty() || engine->mNotifyCallback != nullptr || loopbackOpen) {
            return violation("release", std::string("after ") + step.verb + ":" + (held ? " camera open" : "") +
                                                (!active.empty() ? " renders " + listText(active) : "") +
                                                (engine->mNotifyCallback != nullptr ? " callback kept" : "") +
                                                (loopbackOpen ? " loopback stream open" : ""));
        }
    }
    return "";
}
