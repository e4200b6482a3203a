/*
 * Runtime of the closed media engine (libmme_jrtc): start-up, logging,
 * configuration, its clock and its module messages.
 */
#ifndef QUELLBORN_PLATFORM_ZOS_H
#define QUELLBORN_PLATFORM_ZOS_H

#ifdef __cplusplus
extern "C" {
#endif

/* Where the runtime prints its text. */
typedef int (*PFN_ZOSPRINT)(const char* pcText);

int Zos_CfgSetLogLevel(unsigned int iLevel);
int Zos_CfgSetLogDisp(PFN_ZOSPRINT pfnPrint);
int Zos_CfgSetLogDir(const char* pcDir);
/* The application context, as a JNI global reference the runtime keeps. */
int Zos_CfgSetAppCtx(void* pAppCtx);
int Zos_SysInit(void);
int Zos_SysDestroy(void);
/* The runtime's clock (in its own unit); also stored through puiTime unless null. */
unsigned int Zos_Time(unsigned int* puiTime);
/* Processes the pending module messages on the calling thread. */
int Zos_ModDriveMsg(void);

#ifdef __cplusplus
}
#endif

#endif /* QUELLBORN_PLATFORM_ZOS_H */
