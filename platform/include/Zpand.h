/*
 * Platform adaptation of the media engine's runtime: it delegates its timer
 * and its message loop to functions the platform installs here.
 */
#ifndef QUELLBORN_PLATFORM_ZPAND_H
#define QUELLBORN_PLATFORM_ZPAND_H

#ifndef __cplusplus
#include <stdbool.h>
#endif

#ifdef __cplusplus
extern "C" {
#endif

/* The runtime's expiry callback for its one timer. */
typedef void (*PFN_ZOSTIMERACTIVE)(bool bFlag);

typedef int (*PFN_ZPANDMODPOSTDRV)(void);
typedef int (*PFN_ZPANDTIMERINIT)(void);
typedef int (*PFN_ZPANDTIMERDESTROY)(void);
/* Length in thousandths of the unit of Zos_Time. */
typedef int (*PFN_ZPANDTIMERSTART)(unsigned int iLen, PFN_ZOSTIMERACTIVE pfnActive);
typedef int (*PFN_ZPANDTIMERSTOP)(void);

int Zpand_ModSetPostDrv(PFN_ZPANDMODPOSTDRV pfn);
int Zpand_TimerSetInit(PFN_ZPANDTIMERINIT pfn);
int Zpand_TimerSetDestroy(PFN_ZPANDTIMERDESTROY pfn);
int Zpand_TimerSetStart(PFN_ZPANDTIMERSTART pfn);
int Zpand_TimerSetStop(PFN_ZPANDTIMERSTOP pfn);

#ifdef __cplusplus
}
#endif

#endif /* QUELLBORN_PLATFORM_ZPAND_H */
