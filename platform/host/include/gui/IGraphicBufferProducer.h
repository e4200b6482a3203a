// The buffer queue producer interface of libgui, reduced to what passes
// through the system: an interface that crosses binder and is wrapped in a
// Surface. It declares none of the buffer operations; a local producer is a
// BnGraphicBufferProducer, a producer from another process becomes a proxy
// through asInterface.
#ifndef QUELLBORN_HOST_GUI_IGRAPHICBUFFERPRODUCER_H
#define QUELLBORN_HOST_GUI_IGRAPHICBUFFERPRODUCER_H

#include <binder/IInterface.h>

namespace android {

class IGraphicBufferProducer : public IInterface {
public:
    DECLARE_META_INTERFACE(GraphicBufferProducer)
};

class BnGraphicBufferProducer : public BnInterface<IGraphicBufferProducer> {};

}  // namespace android

#endif  // QUELLBORN_HOST_GUI_IGRAPHICBUFFERPRODUCER_H
