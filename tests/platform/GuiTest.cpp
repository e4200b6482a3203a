// Buffer producers across binder and the Surface made from one: a producer of
// another process becomes a proxy, a local one stays itself, and a surface
// holds its producer until it is released.
#include <binder/Binder.h>
#include <binder/Parcel.h>
#include <gtest/gtest.h>
#include <gui/IGraphicBufferProducer.h>
#include <gui/Surface.h>

#include "RemoteBinder.h"

using namespace android;
using hostbinder::RemoteBinder;

namespace {

// A service that takes a producer from a request, as a binder service does.
class ProducerSink : public BBinder {
public:
    sp<IGraphicBufferProducer> producer;

protected:
    status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
        if (code != FIRST_CALL_TRANSACTION) return BBinder::onTransact(code, data, reply, flags);
        producer = IGraphicBufferProducer::asInterface(data.readStrongBinder());
        return reply->writeInt32(producer != nullptr ? 1 : 0);
    }
};

}  // namespace

TEST(IGraphicBufferProducer, ProxyAndLocalProducerBothCarryTheDescriptor) {
    const String16 descriptor("android.gui.IGraphicBufferProducer");
    sp<RemoteBinder> remote = new RemoteBinder();
    EXPECT_EQ(descriptor, IGraphicBufferProducer::asInterface(remote)->getInterfaceDescriptor());
    EXPECT_EQ(0u, remote->transactionCount());  // wrapping is not a call

    sp<IBinder> local = IInterface::asBinder(sp<BnGraphicBufferProducer>(new BnGraphicBufferProducer()));
    Parcel data, reply;
    EXPECT_EQ(NO_ERROR, local->transact(IBinder::INTERFACE_TRANSACTION, data, &reply));
    EXPECT_EQ(descriptor, reply.readString16());
    // A binder of another interface is not taken for a local producer.
    EXPECT_EQ(nullptr, local->queryLocalInterface(String16("android.test.IOther")));
}

TEST(IGraphicBufferProducer, ProducerSentThroughAParcelArrivesAsProxyOrItself) {
    sp<ProducerSink> sink = new ProducerSink();
    sp<RemoteBinder> remote = new RemoteBinder();
    sp<BnGraphicBufferProducer> local = new BnGraphicBufferProducer();
    auto send = [&](const sp<IBinder>& binder) {
        Parcel data, reply;
        data.writeStrongBinder(binder);
        EXPECT_EQ(NO_ERROR, sink->transact(IBinder::FIRST_CALL_TRANSACTION, data, &reply));
        return reply.readInt32();
    };
    EXPECT_EQ(1, send(remote));
    EXPECT_EQ(sp<IBinder>(remote), IInterface::asBinder(sink->producer));  // a proxy over the sender's binder
    EXPECT_EQ(1, send(IInterface::asBinder(local)));
    EXPECT_EQ(static_cast<IGraphicBufferProducer*>(local.get()), sink->producer.get());
    EXPECT_EQ(nullptr, IGraphicBufferProducer::asInterface(nullptr));
}

TEST(Surface, HoldsItsProducerAndIsCountedWhileAlive) {
    const size_t before = Surface::liveCount();
    wp<RemoteBinder> weakRemote;
    sp<Surface> surface;
    {
        sp<RemoteBinder> remote = new RemoteBinder();
        weakRemote = remote;
        sp<IGraphicBufferProducer> producer = IGraphicBufferProducer::asInterface(remote);
        surface = new Surface(producer);
        EXPECT_EQ(producer, surface->getIGraphicBufferProducer());
    }
    EXPECT_EQ(before + 1, Surface::liveCount());
    EXPECT_FALSE(surface->isControlledByApp());
    // Only the surface holds the producer, and through it the client's binder.
    EXPECT_NE(nullptr, weakRemote.promote());

    sp<Surface> app = new Surface(nullptr, true);
    EXPECT_TRUE(app->isControlledByApp());

    surface.clear();
    EXPECT_EQ(before + 1, Surface::liveCount());
    EXPECT_EQ(nullptr, weakRemote.promote());
    app.clear();
    EXPECT_EQ(before, Surface::liveCount());
}
