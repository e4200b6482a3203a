#include <gui/Surface.h>

#include <atomic>

namespace android {

namespace {
std::atomic<size_t> gLiveSurfaces{0};
}

Surface::Surface(const sp<IGraphicBufferProducer>& bufferProducer, bool controlledByApp)
    : mGraphicBufferProducer(bufferProducer), mControlledByApp(controlledByApp) {
    gLiveSurfaces.fetch_add(1, std::memory_order_relaxed);
}

Surface::~Surface() { gLiveSurfaces.fetch_sub(1, std::memory_order_relaxed); }

sp<IGraphicBufferProducer> Surface::getIGraphicBufferProducer() const { return mGraphicBufferProducer; }

bool Surface::isControlledByApp() const { return mControlledByApp; }

size_t Surface::liveCount() { return gLiveSurfaces.load(std::memory_order_relaxed); }

}  // namespace android
