// The engine loaded from every side at once: client threads sending the
// service's transactions, the modem starting, holding, resuming and ending
// streams on the link's pipe, and the media libraries raising events on their
// own threads, while dumpsys reads the service. Each side counts what it did: every request must be answered,
// every stream start get exactly one bind request, and every event reach the
// client, or be dropped for want of a callback, exactly once.
#include <map>

#include "EngineTestUtil.h"
#include "HostBinder.h"
#include "MmeJni.h"
#include "Mvd.h"
#include "WatchedThreads.h"

using namespace android;
using namespace enginecase;
using namespace std::chrono_literals;
using hostbinder::RemoteBinder;

namespace {

constexpr auto kLoadTime = 1500ms;  // each thread starts rounds until then, at least one
constexpr auto kPause = 1ms;        // between a thread's rounds, so no side swamps the log and call record
constexpr auto kWatchdog = 60s;     // far beyond any round, also under TSan on a busy machine
constexpr int kClients = 4;
const std::string kSent = "BpVideoCallEngineCallback notifyCallback";

// One client thread's rounds, and the first answer other than int32 0 with status 0.
struct Tally {
    size_t rounds = 0;
    std::string wrong;
    void check(uint32_t code, std::initializer_list<int32_t> ints, const sp<IBinder>& binder = nullptr,
               const char* text = nullptr) {
        const enginetest::Reply r = enginetest::call(code, ints, binder, text);
        if (wrong.empty() && (r.status != NO_ERROR || r.size != sizeof(int32_t) || r.value != 0)) {
            wrong = "code " + std::to_string(code) + ": status " + std::to_string(r.status) + ", int32 " +
                    std::to_string(r.value) + ", " + std::to_string(r.size) + " bytes";
        }
    }
};

class StressTest : public EngineCase {
protected:
    size_t lines(const char* tag, const std::string& text) const { return log.count(ANDROID_LOG_INFO, tag, text); }
};

}  // namespace

TEST_F(StressTest, ClientsModemAndMediaAtOnceLoseAndDuplicateNothing) {
    ASSERT_EQ(0, Mvd_EvntSetCallback(Mvd_EvntProc, 1));  // as the media engine's start-up does
    const size_t opensBefore = hostfakes::callCount("Mvd_Open"), closesBefore = hostfakes::callCount("Mvd_Close");
    const auto until = std::chrono::steady_clock::now() + kLoadTime;
    auto loading = [&] {
        std::this_thread::sleep_for(kPause);
        return std::chrono::steady_clock::now() < until;
    };
    WatchedThreads load(kWatchdog);

    Tally tallies[kClients];
    sp<RemoteBinder> clients[kClients];
    for (int i = 0; i < kClients; ++i) {
        clients[i] = enginetest::remoteCallback();
        load.run([&, i] {
            Tally& t = tallies[i];
            do {
                t.check(kCameraId, {i % 2});
                t.check(kCameraSize, {1 + i % 3});
                t.check(kOrientation, {90 * i, i % 4, i % 2});
                t.check(kUplinkQos, {300 + 200 * i + static_cast<int32_t>(t.rounds % 2)});
                t.check(kSetSurface, {i % 2}, enginetest::remoteProducer());
                t.check(kHideImage, {1}, nullptr, "/data/vce/hold.png");
                t.check(kSetCallback, {}, clients[i]);
                t.check(kHideImage, {0});
                t.check(kCleanCallback, {});
                t.check(kCleanSurface, {i % 2});
                t.check(kCameraId, {-1});
                ++t.rounds;
            } while (loading());
        });
    }

    // The modem waits for each start's bind request before it holds, resumes and ends the stream.
    int starts = 0, binds = 0;
    std::string badBind;
    load.run([&] {
        vtspcodec::StreamCommand c = streamCommand(_VTSP_CMD_STREAM_VIDEO_START, 1000);
        auto write = [&](int32_t code, uint32_t dir) {
            c.code = code;
            c.dir = dir;
            modemSends(c);
        };
        do {
            ++c.streamId;
            c.localAddr = vtspcodec::address("10.0.0.1", static_cast<uint16_t>(6000 + 2 * (c.streamId % 500)));
            write(_VTSP_CMD_STREAM_VIDEO_START, VTSP_STREAM_DIR_SENDRECV);
            ++starts;
            VPR_Comm reply{};
            const bool got = enginetest::modem().readRecord(&reply, 20s);
            const vtspcodec::BindRequest bind = vtspcodec::readBindRequest(reply);
            if (!got || bind.code != VPR_NET_CMD_BIND || bind.streamId != static_cast<int32_t>(c.streamId)) {
                badBind = "stream " + std::to_string(c.streamId) + ": " +
                          (got ? "code " + std::to_string(bind.code) + " for stream " + std::to_string(bind.streamId)
                               : "no reply");
                return;
            }
            ++binds;
            write(_VTSP_CMD_STREAM_VIDEO_MODITY, _VTSP_STREAM_DIR_INACTIVE);
            write(_VTSP_CMD_STREAM_VIDEO_MODITY, VTSP_STREAM_DIR_SENDRECV);
            write(_VTSP_CMD_STREAM_VIDEO_END, VTSP_STREAM_DIR_SENDRECV);
        } while (loading());
    });

    // The media engine's events (each on a new native thread) and the video library's.
    int breaks = 0, recoveries = 0, sizes = 0, unhandledMvd = 0, unhandledZmf = 0;
    load.run([&] {
        do {
            const int event = breaks == recoveries ? 22 : 23;
            ++(event == 22 ? breaks : recoveries);
            unhandledMvd += hostfakes::fireMvdEvent(tagMVD_EVNT{{event}}) != 0;
        } while (loading());
    });
    load.run([&] {
        do {
            unhandledZmf += !hostfakes::fireZmfEvent(27, kRemoteSize);
            ++sizes;
        } while (loading());
    });
    // dumpsys while all of it runs: every dump whole, none waiting for the rest.
    size_t dumps = 0;
    std::string badDump;
    load.run([&] {
        do {
            const std::string text = hostbinder::dumpsys(enginetest::service(), {});
            ++dumps;
            for (const char* heading : {"engine:\n", "\nmodem link:\n", "\nstreams: ", "\nrecent commands: "}) {
                if (badDump.empty() && text.find(heading) == std::string::npos) badDump = text;
            }
        } while (loading());
    });
    load.join();
    EXPECT_EQ("", badDump);
    EXPECT_LT(0u, dumps);

    size_t rounds = 0;
    for (int i = 0; i < kClients; ++i) {
        EXPECT_EQ("", tallies[i].wrong) << "client " << i;
        rounds += tallies[i].rounds;
    }
    // Each request reached the service once.
    EXPECT_EQ(2 * rounds, lines(kServiceTag, "VCE_ACTION_SET_CAMERAID"));
    EXPECT_EQ(rounds, lines(kServiceTag, "VCE_ACTION_SET_CALLBACK"));
    EXPECT_EQ(rounds, lines(kServiceTag, "VCE_ACTION_CLEAN_CALLBACK"));
    EXPECT_EQ(2 * rounds, lines(kServiceTag, "VCE_ACTION_HIDE_LOCAL_IMAGE"));

    // One bind request per start and nothing else on the pipe; every stream opened and closed once.
    EXPECT_EQ("", badBind);
    EXPECT_EQ(starts, binds);
    EXPECT_TRUE(enginetest::modem().silentFor(200ms));
    EXPECT_EQ(static_cast<size_t>(starts), hostfakes::callCount("Mvd_Open") - opensBefore);
    EXPECT_TRUE(eventually([&] { return hostfakes::callCount("Mvd_Close") - closesBefore == static_cast<size_t>(starts); }))
            << starts << " streams started, " << hostfakes::callCount("Mvd_Close") - closesBefore << " closed";
    // The link counted what went over the pipe.
    const std::string link = hostbinder::dumpsys(enginetest::service(), {"--link"});
    EXPECT_NE(std::string::npos, link.find("  read: " + std::to_string(4 * starts) + " records, ")) << link;
    EXPECT_NE(std::string::npos, link.find("  written: " + std::to_string(binds) + " records, ")) << link;

    // Every event reached the engine once, then the client (each transaction whole) or nobody.
    EXPECT_EQ(0, unhandledMvd);
    EXPECT_EQ(0, unhandledZmf);
    EXPECT_EQ(static_cast<size_t>(breaks), lines(kEngineTag, "mmeEvtUpdate evt: 22"));
    EXPECT_EQ(static_cast<size_t>(recoveries), lines(kEngineTag, "mmeEvtUpdate evt: 23"));
    EXPECT_EQ(static_cast<size_t>(sizes), lines(kEngineTag, "zmfRenderEvtUpdate, evt:28 [Remote], type 0, [640x480]"));
    const size_t sentBreaks = lines(kEngineTag, kSent + ", 14"), sentRecoveries = lines(kEngineTag, kSent + ", 15"),
                 sentSizes = lines(kEngineTag, kSent + " with data, 11, 640, 480, 0");
    std::map<std::string, size_t> delivered{
            {"code 0 flags 0: 14", 0}, {"code 0 flags 0: 15", 0}, {"code 1 flags 0: 11 640 480 0", 0}};
    for (const sp<RemoteBinder>& client : clients) {
        for (const std::string& t : received(*client)) ++delivered[t];
    }
    EXPECT_EQ((std::map<std::string, size_t>{{"code 0 flags 0: 14", sentBreaks},
                                             {"code 0 flags 0: 15", sentRecoveries},
                                             {"code 1 flags 0: 11 640 480 0", sentSizes}}),
              delivered);
    EXPECT_EQ(static_cast<size_t>(breaks + recoveries + sizes),
              sentBreaks + sentRecoveries + sentSizes + lines(kEngineTag, "notifyCallback null"));

    send(kCleanCallback);
    send(kRelease);
}
