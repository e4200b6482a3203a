/*
 * Video API of the closed media engine (libmme_jrtc), as the system calls it.
 *
 * Every function returns an int status, 0 for success, unless noted. Stream
 * ids are the engine's own (0 means none). Strings are NUL-terminated and
 * only read during the call.
 */
#ifndef QUELLBORN_PLATFORM_MVD_H
#define QUELLBORN_PLATFORM_MVD_H

#ifdef __cplusplus
extern "C" {
#endif

/* The engine's codec record: twenty 32-bit words. The system reads and writes
 * only the words named below and hands the rest back untouched. */
typedef struct tagMVD_CODEC {
    int aiWord[20];
} tagMVD_CODEC;

enum {
    MVD_CODEC_WORD_PAYLOAD = 0,
    MVD_CODEC_WORD_BITRATE = 2,
    MVD_CODEC_WORD_FRAMERATE = 3,
    MVD_CODEC_WORD_WIDTH = 4,
    MVD_CODEC_WORD_HEIGHT = 5,
    MVD_CODEC_WORDS = 20
};

/* RTP header extension types for Mvd_RtpSetExt. */
enum { MVD_RTP_EXT_VIDEO_ORIENTATION = 2 };

int Mvd_Open(const char* pcLocalAddr, unsigned short wLocalPort, unsigned int* piStrmId);
int Mvd_Close(unsigned int iStrmId);
int Mvd_SetRmtAddr(unsigned int iStrmId, const char* pcRmtAddr, unsigned short wRmtPort);
int Mvd_SetUniqueName(unsigned int iStrmId, const char* pcName);
int Mvd_GetCdc(unsigned int iStrmId, const char* pcCdcName, tagMVD_CODEC* pstCdc);
int Mvd_SetCdc(unsigned int iStrmId, tagMVD_CODEC* pstCdc);
int Mvd_SetSendPayload(unsigned int iStrmId, unsigned char ucPayload);
int Mvd_ArsSetEnable(unsigned int iStrmId, int bEnable);
int Mvd_ArsSetParm(unsigned int iStrmId, int iMinBitRate, int iMaxBitRate, int iMinFrameRate,
                   int iFrameRate);
int Mvd_SuspendAllStrm(void);
int Mvd_ResumeAllStrm(void);
int Mvd_TptEnableTmmbr(unsigned int iStrmId, int bEnable);
int Mvd_TptEnableNack(unsigned int iStrmId, int bEnable);
int Mvd_TptEnableFir(unsigned int iStrmId, int bEnable);
int Mvd_RtpSetExt(unsigned int iStrmId, int iExtType, unsigned char ucExtId);
int Mvd_RedSetEnable(unsigned int iStrmId, int bEnable);
int Mvd_TptSetSend(unsigned int iStrmId, int bEnable);
int Mvd_TptSetRecv(unsigned int iStrmId, int bEnable);
int Mvd_ProcStart(unsigned int iStrmId);
int Mvd_ProcStop(unsigned int iStrmId);
int Mvd_CaptureAttach(unsigned int iStrmId, const char* pcCaptureName);
int Mvd_CaptureDetach(unsigned int iStrmId);
int Mvd_FileStartSendImage(unsigned int iStrmId, const char* pcFilePath);
int Mvd_FileStopSendImage(unsigned int iStrmId);

/* The video module's task. */
int Mvd_TaskStart(void);
int Mvd_TaskStop(void);

/* An event of the video module: 32-bit words, word 0 the event number; the
 * meaning of the others depends on the event. */
enum { MVD_EVNT_WORDS = 16 };
typedef struct tagMVD_EVNT {
    int aiWord[MVD_EVNT_WORDS];
} tagMVD_EVNT;

typedef int (*PFN_MVDEVNTPROC)(tagMVD_EVNT* pstEvnt, unsigned int iCookie);
int Mvd_EvntSetCallback(PFN_MVDEVNTPROC pfnProc, int bEnable);

/* RTCP statistics of a stream: ten 32-bit words. */
enum { MVD_RTCP_STA_WORDS = 10 };
typedef struct tagMVD_RTCP_STA {
    int aiWord[MVD_RTCP_STA_WORDS];
} tagMVD_RTCP_STA;

int Mvd_RtcpGetSta(unsigned int iStrmId, tagMVD_RTCP_STA* pstSta);

#ifdef __cplusplus
/* The library is built for the handset's 32-bit x86 ABI and the host's
 * stand-in for x86-64: each record is whole 32-bit words on both, with
 * nothing wider that one ABI would align differently from the other. */
static_assert(sizeof(int) == 4, "the engine's words are 32-bit");
static_assert(sizeof(tagMVD_CODEC) == 4 * MVD_CODEC_WORDS, "codec record: twenty words");
static_assert(alignof(tagMVD_CODEC) == 4, "codec record: word-aligned");
static_assert(sizeof(tagMVD_EVNT) == 4 * MVD_EVNT_WORDS, "event record: sixteen words");
static_assert(alignof(tagMVD_EVNT) == 4, "event record: word-aligned");
static_assert(sizeof(tagMVD_RTCP_STA) == 4 * MVD_RTCP_STA_WORDS, "statistics record: ten words");
static_assert(alignof(tagMVD_RTCP_STA) == 4, "statistics record: word-aligned");
#endif

#ifdef __cplusplus
}
#endif

#endif /* QUELLBORN_PLATFORM_MVD_H */
