#include "MediaActor.h"

#include "HostFakes.h"
#include "MmeJni.h"
#include "Mvd.h"

namespace {

// Words of the video module's event record that carry each event's values.
constexpr int kCodecWords = 7;        // event 7: words 7 and 8
constexpr int kCaptureSizeWords = 9;  // event 6: words 9 and 10

std::vector<int32_t> eventWords(int32_t event, int firstWord, const std::vector<int32_t>& values) {
    std::vector<int32_t> words(static_cast<size_t>(firstWord) + values.size(), 0);
    words[0] = event;
    for (size_t i = 0; i < values.size(); ++i) words[static_cast<size_t>(firstWord) + i] = values[i];
    return words;
}

}  // namespace

MediaActor::MediaActor(Timeline* timeline) : mTimeline(timeline) {
    Mvd_EvntSetCallback(android::Mvd_EvntProc, 1);
}

void MediaActor::show(const std::string& text) {
    TimelineEntry entry;
    entry.actor = "media";
    entry.target = "engine";
    entry.text = text;
    entry.mscFrom = "media";
    entry.mscTo = "vce";
    mTimeline->add(entry);
}

void MediaActor::mvdEvent(const std::vector<int32_t>& words, const std::string& what) {
    tagMVD_EVNT event{};
    for (size_t i = 0; i < words.size() && i < MVD_EVNT_WORDS; ++i) event.aiWord[i] = words[i];
    show("Mvd_EvntProc " + std::to_string(words[0]) + " " + android::Mme_GetMvdEventName(words[0]) + what);
    hostfakes::fireMvdEvent(event);
}

void MediaActor::zmfEvent(int event, const std::string& json, const std::string& what) {
    show("zmf event " + std::to_string(event) + what + " " + json);
    hostfakes::fireZmfEvent(event, json.c_str());
}

void MediaActor::perform(const ScenarioStep& step) {
    const std::vector<int32_t>& v = step.ints;
    if (step.verb == "rtp-first") {
        mvdEvent({21}, "");
    } else if (step.verb == "rtp-break") {
        mvdEvent({22}, "");
    } else if (step.verb == "rtp-received") {
        mvdEvent({23}, "");
    } else if (step.verb == "codec-changed") {
        mvdEvent(eventWords(7, kCodecWords, v), " " + std::to_string(v[0]) + " " + std::to_string(v[1]));
    } else if (step.verb == "capture-size") {
        mvdEvent(eventWords(6, kCaptureSizeWords, v), " " + std::to_string(v[0]) + "x" + std::to_string(v[1]));
    } else if (step.verb == "event") {
        mvdEvent(v, "");
    } else if (step.verb == "remote-size") {
        // The render library reports the remote view's size with event 27.
        const std::string json = R"({"Render":"Remote","SourceType":0,"Window":1,"Width":)" + std::to_string(v[0]) +
                                 R"(,"Height":)" + std::to_string(v[1]) + "}";
        zmfEvent(27, json, " (remote render size)");
    } else if (step.verb == "zmf") {
        zmfEvent(v[0], step.text, "");
    }
}
