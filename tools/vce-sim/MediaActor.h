// The closed media libraries' side of a simulated call: events of the media
// engine's video module (delivered to the system's Mvd_EvntProc on a thread
// of the fake engine) and JSON events of the video library's listener.
#ifndef QUELLBORN_TOOLS_VCESIM_MEDIAACTOR_H
#define QUELLBORN_TOOLS_VCESIM_MEDIAACTOR_H

#include <string>

#include "Scenario.h"
#include "Timeline.h"

class MediaActor {
public:
    // Installs the system's event procedure with the media engine, as the
    // host application's Mme.sysInit does on a device.
    explicit MediaActor(Timeline* timeline);

    void perform(const ScenarioStep& step);

private:
    void mvdEvent(const std::vector<int32_t>& words, const std::string& what);
    void zmfEvent(int event, const std::string& json, const std::string& what);
    void show(const std::string& text);

    Timeline* const mTimeline;
};

#endif  // QUELLBORN_TOOLS_VCESIM_MEDIAACTOR_H
