// The C API as C callers see it, and the KivImaging callback relay.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "core/KivImaging.h"
#include "support/log_capture.h"
#include "test_effects.h"
#include "vccore/vc_log.h"

extern "C" int kivtest_c_null_handles(void);

namespace {

TEST(KivImagingCApi, NullHandlesFromC) {
    LogCapture log;  // keeps the factory's debug lines out of the output
    EXPECT_EQ(kivtest_c_null_handles(), 0) << "failed check at kivimaging_c_api.c line shown";
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
