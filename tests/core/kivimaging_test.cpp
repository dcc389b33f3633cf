// The C API as C callers see it, and the KivImaging callback relay.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "core/KivImaging.h"
#include "support/log_capture.h"
#include "test_effects.h"
#include "vccore/vc_log.h"

extern "C" int kivtest_c_null_handles(void);
extern "C" int kivtest_c_drive(KivFilter* filter, int expectedType);

namespace {

TEST(KivImagingCApi, NullHandlesFromC) {
    LogCapture log;  // keeps the factory's debug lines out of the output
    EXPECT_EQ(kivtest_c_null_handles(), 0) << "failed check at kivimaging_c_api.c line shown";
}

TEST(KivImagingCApi, DriveEffectFromC) {
    ProbeEffect* effect = new ProbeEffect(440);
    LogCapture log;
    EXPECT_EQ(kivtest_c_drive(effect, 440), 0) << "failed check at kivimaging_c_api.c line shown";
    // What the C side did is visible on the object: released working image,
    // wrappers still in place, flag set.
    EXPECT_EQ(effect->workImage(), nullptr);
    EXPECT_EQ(effect->workChangedCalls, 2);  // made by init, dropped by release
    ASSERT_NE(effect->outputImage(), nullptr);
    EXPECT_EQ(effect->outputImage()->width, 8);
    EXPECT_EQ(effect->getValue(111, 0), 1);
    int live = ProbeEffect::sLive;
    KivImaging_destroy(effect);
    EXPECT_EQ(ProbeEffect::sLive, live - 1);
}

TEST(KivImagingCApi, CreateLogsTheRequest) {
    LogCapture log;
    KivFilter* f = KivImaging_create(203, nullptr);
    EXPECT_EQ(f, nullptr);
    EXPECT_TRUE(log.contains(VF_LOG_DEBUG, "Trying to instantiate effect 203"));
    EXPECT_EQ(log.count("Trying to instantiate effect 203"), 1u);
}

struct Received {
    std::vector<std::string> messages;
    std::vector<void*> contexts;
};

void clientCallback(const char* message, void* context) {
    Received* received = static_cast<Received*>(context);
    received->messages.push_back(message);
    received->contexts.push_back(context);
}

TEST(KivImagingHandle, CallbackRelaysWithClientContext) {
    ProbeEffect effect;
    Received received;

    // No filter: nothing stored, so nothing can be relayed later.
    KivImaging empty;
    empty.kivImagingSetCallback(clientCallback, &received);
    empty.setFilter(&effect);
    effect.report("dropped");
    EXPECT_TRUE(received.messages.empty());

    KivImaging imaging(&effect);
    imaging.kivImagingSetCallback(clientCallback, &received);
    effect.report("face found");
    effect.report("face lost");
    ASSERT_EQ(received.messages.size(), 2u);
    EXPECT_EQ(received.messages[0], "face found");
    EXPECT_EQ(received.messages[1], "face lost");
    // The client sees its own context, not the relay's.
    EXPECT_EQ(received.contexts[0], &received);

    // A null client callback silences the relay without crashing.
    imaging.kivImagingSetCallback(nullptr, &received);
    effect.report("ignored");
    EXPECT_EQ(received.messages.size(), 2u);
}

}  // namespace
