// Control API of the host stand-ins for the closed libraries.
//
// Every stand-in records each call (name, arguments as text, result) in one
// process-wide record, in call order. Tests read the record, override the
// result of a function, and seed the state the fakes keep. The same record
// can be written as a text trace (docs/host-platform.md).
#ifndef QUELLBORN_HOST_HOSTFAKES_H
#define QUELLBORN_HOST_HOSTFAKES_H

#include <string>
#include <vector>

#include "Mvd.h"
#include "Zpand.h"

namespace hostfakes {

struct Call {
    std::string name;
    std::vector<std::string> args;
    int result = 0;
    // "Mvd_SetRmtAddr(1, \"192.168.1.2\", 5000) = 0"
    std::string text() const;
};

// Forgets every recorded call, result override and fake state.
void reset();

std::vector<Call> calls();
std::vector<std::string> callTexts();
std::vector<std::string> callNames();
// Calls recorded since position `from` (as text).
std::vector<std::string> callTextsSince(size_t from);
size_t callCount();
// How many recorded calls went to `function`.
size_t callCount(const std::string& function);

// Keeps each call in the record (the default) or lets it pass unkept (the
// trace still sees it). Long benchmarks switch keeping off so that the
// record's own growth is not mistaken for the system's. reset() keeps the setting.
void setRecording(bool keep);

// Makes every later call of `function` return `result` (and skip its effect,
// as a failing library call would).
void setResult(const std::string& function, int result);
void clearResult(const std::string& function);

// Makes every later call of `function` wait, on the caller's thread, until
// releaseCalls() (or reset()): a media engine that stops answering.
void holdCalls(const std::string& function);
void releaseCalls();

// Writes every recorded call as a trace line to `target`: "stderr",
// "stdout" or a file path (appended). Null or "" switches the trace off. The
// environment variable QUELLBORN_TRACE sets the same at start-up.
void setTrace(const char* target);

// Media engine video streams: ids handed out by Mvd_Open start at 1.
void setNextMvdStreamId(unsigned int id);
// The codec record Mvd_GetCdc reports for an open stream; Mvd_SetCdc replaces it.
void setMvdCodec(unsigned int streamId, const tagMVD_CODEC& codec);
bool getMvdCodec(unsigned int streamId, tagMVD_CODEC* codec);
// Streams that are open in the fake engine, ascending.
std::vector<unsigned int> openMvdStreams();
// Open streams suspended by Mvd_SuspendAllStrm and not resumed since, ascending.
std::vector<unsigned int> suspendedMvdStreams();

// Video library: calls the listener the system registered, on the calling
// thread, as the library's event thread would. False when none is registered.
bool fireZmfEvent(int event, const char* json, int arg = 0);
bool zmfListenerRegistered();
bool zmfInitialized();

// Camera driver: the handle the next successful camdrvOpen returns (handles
// start at 0x100 and count up). Make camdrvOpen fail with setResult(..., 0).
void setNextCameraHandle(int handle);
// Handles of the captures that are open, ascending.
std::vector<int> openCameras();

// Render library: renderRemove sleeps this long before it removes the render,
// so a test can show that nobody waits for it; setting it back to 0 ends the
// sleeps in progress, so a very long delay plays a hung library call.
void setRenderRemoveDelayMs(int ms);
// Ids of the renders that are added, ascending.
std::vector<std::string> activeRenders();
// Blocks until `count` renderRemove calls have completed in all; false on timeout.
bool waitForRenderRemoves(size_t count, int timeoutMs = 5000);

// Media engine runtime: the value Zos_Time answers (0 until set).
void setZosTime(unsigned int now);
// Prints through the sink the system installed with Zos_CfgSetLogDisp;
// false when none is installed.
bool zosPrint(const char* text);

// Media engine: version texts (null allowed) and provisioning values.
void setVersions(const char* melonVersion, const char* mmeVersion);
void setProvValue(const std::string& key, int value);
void setProvString(const std::string& key, const char* text);
void setProvMapString(const std::string& key, int index, const char* text);
// RTCP statistics Mvd_RtcpGetSta reports for a stream (others fail).
void setRtcpStats(unsigned int streamId, const tagMVD_RTCP_STA& stats);

// The media engine's own threads. Each call below runs on a new native
// thread of the fake engine, which no virtual machine knows, waits for it and
// returns what the system's function returned (kNotInstalled when the
// system has installed none).
constexpr int kNotInstalled = -1000;
int fireMvdEvent(const tagMVD_EVNT& event);
int fireZpandModPostDrv();
int fireZpandTimerInit();
int fireZpandTimerDestroy();
// Starts the runtime's timer; its expiry callback is recorded as
// "Zos_TimerActive(<flag>)" when the system calls it.
int fireZpandTimerStart(unsigned int length);
int fireZpandTimerStop();

}  // namespace hostfakes

#endif  // QUELLBORN_HOST_HOSTFAKES_H
