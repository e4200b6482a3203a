// libgui's Surface reduced to what the system does with one: made from a
// buffer producer and handed to the render library, which draws into it and
// drops it when the render goes. It holds its producer for its lifetime.
//
// liveCount() counts the Surfaces that exist in the process, so a test can
// see that a surface handed over is released again.
#ifndef QUELLBORN_HOST_GUI_SURFACE_H
#define QUELLBORN_HOST_GUI_SURFACE_H

#include <gui/IGraphicBufferProducer.h>
#include <utils/RefBase.h>

#include <cstddef>

namespace android {

class Surface : public RefBase {
public:
    explicit Surface(const sp<IGraphicBufferProducer>& bufferProducer, bool controlledByApp = false);

    sp<IGraphicBufferProducer> getIGraphicBufferProducer() const;
    bool isControlledByApp() const;

    static size_t liveCount();

protected:
    // Reference counted: released through its last strong reference.
    ~Surface() override;

private:
    Surface(const Surface&) = delete;
    Surface& operator=(const Surface&) = delete;

    const sp<IGraphicBufferProducer> mGraphicBufferProducer;
    const bool mControlledByApp;
};

}  // namespace android

#endif  // QUELLBORN_HOST_GUI_SURFACE_H
