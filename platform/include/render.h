/*
 * The closed render library, as the system calls it. A render draws the
 * frames of the capture or stream of the same id into a surface.
 */
#ifndef QUELLBORN_PLATFORM_RENDER_H
#define QUELLBORN_PLATFORM_RENDER_H

namespace android {
class Surface;
}

extern "C" {

int renderInit(void);
int renderTerm(void);
/* Takes the surface over: the library holds its own reference and releases
 * it when the render is removed. 0 on success. */
int renderAdd(android::Surface* pSurface, const char* pcRenderId);
int renderRotate(const char* pcRenderId, int iAngle);
/* May take a while; the system calls it on a thread of its own. */
int renderRemove(const char* pcRenderId);

}

#endif /* QUELLBORN_PLATFORM_RENDER_H */
