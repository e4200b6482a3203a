#include <gui/IGraphicBufferProducer.h>

namespace android {

// The producer of another process; it has no operations to forward.
class BpGraphicBufferProducer : public BpInterface<IGraphicBufferProducer> {
public:
    explicit BpGraphicBufferProducer(const sp<IBinder>& impl) : BpInterface<IGraphicBufferProducer>(impl) {}
};

IMPLEMENT_META_INTERFACE(GraphicBufferProducer, "android.gui.IGraphicBufferProducer")

}  // namespace android
