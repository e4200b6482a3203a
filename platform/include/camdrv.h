/*
 * The closed camera driver, as the system calls it. A capture is known by
 * the 32-bit handle camdrvOpen returns (0: failure).
 */
#ifndef QUELLBORN_PLATFORM_CAMDRV_H
#define QUELLBORN_PLATFORM_CAMDRV_H

#ifdef __cplusplus
extern "C" {
#endif

int camdrvInit(const char* pcPackageName, int iValue, const char* pcLibPath);
int camdrvTerm(void);
/* Opens a camera and starts capturing under pcCaptureName. */
int camdrvOpen(const char* pcCaptureName, int iCameraId, int iFacing, int iOrientation,
               int iWidth, int iHeight, int iFrameRate);
int camdrvStop(int iHandle);
int camdrvResize(int iHandle, int iWidth, int iHeight, int iFrameRate);
/* Rotation applied to captured frames, in degrees. */
int camdrvOrientAngle(int iAngle);

#ifdef __cplusplus
}
#endif

#endif /* QUELLBORN_PLATFORM_CAMDRV_H */
