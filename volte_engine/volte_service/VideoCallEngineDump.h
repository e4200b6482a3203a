// The text that `dumpsys VideoCallEngineService` prints: the engine, the
// modem link, every stream and the recent commands, in sections of
// "key: value" lines that a script can grep. Arguments select sections.
//
// Everything is copied first, each piece under its own lock and only for as
// long as the copy takes; the text is then built with no lock held.
#ifndef QUELLBORN_VOLTE_VIDEOCALLENGINEDUMP_H
#define QUELLBORN_VOLTE_VIDEOCALLENGINEDUMP_H

#include <utils/String16.h>
#include <utils/Vector.h>

#include <string>

namespace android {

class VideoCallEngineImpl;

class VideoCallEngineDump {
public:
    enum Section : unsigned {
        SECTION_ENGINE = 1u << 0,
        SECTION_LINK = 1u << 1,
        SECTION_STREAMS = 1u << 2,
        SECTION_HISTORY = 1u << 3,
        SECTION_ALL = SECTION_ENGINE | SECTION_LINK | SECTION_STREAMS | SECTION_HISTORY,
    };
    // How long the dump tries an engine lock that an operation holds
    // (across the camera driver, the renderer or the client) before it
    // reports the state as not read.
    static constexpr int kEnginePatienceMs = 100;

    // "--engine", "--link", "--streams", "--history" select; none (or only
    // arguments it does not know, such as a bug report's) select every
    // section; "-h" asks for the usage.
    explicit VideoCallEngineDump(const Vector<String16>& args);

    // The usage for "-h", or the selected sections of `engine` (null: none).
    std::string text(VideoCallEngineImpl* engine) const;

    static std::string usage();

private:
    void appendEngine(std::string& out, VideoCallEngineImpl& engine) const;
    void appendLink(std::string& out, VideoCallEngineImpl& engine) const;
    void appendStreams(std::string& out, VideoCallEngineImpl& engine) const;
    void appendHistory(std::string& out, VideoCallEngineImpl& engine) const;

    unsigned mSections = 0;
    bool mHelp = false;
};

}  // namespace android

#endif  // QUELLBORN_VOLTE_VIDEOCALLENGINEDUMP_H
