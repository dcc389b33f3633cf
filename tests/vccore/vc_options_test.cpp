// kiv-test-labels: threads
// The option registry: keys, duplicates, clashes, the dump, value checks, the
// parameter-string parsers and the sort utility.
#include <gtest/gtest.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cmath>
#include <future>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "support/log_capture.h"
#include "vccore/vc_log.h"
#include "vccore/vc_options.h"

namespace {

VCOption_t makeOption(const char* name, VCOptionType_t type, int lo = 0, int hi = 0) {
    VCOption_t o = {};
    o.name = name;
    o.type = o.min.type = o.max.type = type;
    o.min.value.i = lo;
    o.max.value.i = hi;
    return o;
}

std::string hex(uint32_t key) {
    char buf[16];
    snprintf(buf, sizeof(buf), "0x%08x", key);
    return buf;
}

void quietLog(int, const char*, ...) {}

// Declared first: gtest runs a file's tests in order, and the counter starts
// at its base only for the first registration of the process.
TEST(VcOptions, KeysCountUpFromTheBase) {
    static VCOption_t first = makeOption("keys.first", VCOPTION_TYPE_INTEGER);
    static VCOption_t second = makeOption("keys.second", VCOPTION_TYPE_FLOAT);
    EXPECT_EQ(1, VCOption_RegisterNew(&first));
    EXPECT_EQ(1, VCOption_RegisterNew(&second));
    EXPECT_EQ(0x13370001u, first.key);
    EXPECT_EQ(0x13370002u, second.key);
}

TEST(VcOptions, DuplicatesShareAKeyAndClashesAreRefused) {
    static VCOption_t a = makeOption("parameter", VCOPTION_TYPE_STRING);
    static VCOption_t b = makeOption("parameter", VCOPTION_TYPE_STRING);
    static VCOption_t intOrientation = makeOption("orientation", VCOPTION_TYPE_INTEGER, 0, 3);
    static VCOption_t floatOrientation = makeOption("orientation", VCOPTION_TYPE_FLOAT);
    static VCOption_t intruder = makeOption("clash.intruder", VCOPTION_TYPE_INTEGER);
    ASSERT_EQ(1, VCOption_RegisterNew(&a));
    ASSERT_EQ(1, VCOption_RegisterNew(&b));
    EXPECT_EQ(a.key, b.key);
    EXPECT_EQ(&a, VCOption_FindById(a.key));
    EXPECT_EQ(&a, VCOption_FindByName("parameter"));
    // Same name, other type: another key; by name the first in key order.
    ASSERT_EQ(1, VCOption_RegisterNew(&intOrientation));
    ASSERT_EQ(1, VCOption_RegisterNew(&floatOrientation));
    EXPECT_NE(intOrientation.key, floatOrientation.key);
    EXPECT_EQ(&intOrientation, VCOption_FindByName("orientation"));
    EXPECT_EQ(intOrientation.key, VCOption_FindIdByName("orientation"));
    EXPECT_STREQ("orientation", VCOption_FindNameById(floatOrientation.key));
    EXPECT_EQ(&floatOrientation, VCOption_FindById(floatOrientation.key));
    // An existing key under another name.
    intruder.key = a.key;
    LogCapture log;
    EXPECT_EQ(0, VCOption_RegisterNew(&intruder));
    EXPECT_TRUE(
        log.matches({"E ERROR: Trying to register new option with an already existing "
                     "key! [key = " +
                     hex(a.key) + "]"}));
    EXPECT_EQ(1u, log.lines().size());
    EXPECT_EQ(&a, VCOption_FindById(a.key));
    EXPECT_EQ(nullptr, VCOption_FindByName("clash.intruder"));

    EXPECT_EQ(0u, VCOption_FindIdByName("no-such-option"));
    EXPECT_EQ(nullptr, VCOption_FindByName(nullptr));
    EXPECT_EQ(nullptr, VCOption_FindById(0x7fffffff));
    EXPECT_EQ(nullptr, VCOption_FindNameById(0));
    EXPECT_EQ(0, VCOption_RegisterNew(nullptr));
}

// Each registration dumps the registry; only its error lines are pinned.
TEST(VcOptions, RegistryDumpFlagsBrokenRecords) {
    static VCOption_t bare = makeOption("dump.bare", VCOPTION_TYPE_ENUM);
    static VCOption_t odd = makeOption("dump.odd", static_cast<VCOptionType_t>(9));
    LogCapture log;
    for (VCOption_t* o : {&bare, &odd}) ASSERT_EQ(1, VCOption_RegisterNew(o));
    std::vector<std::string> errors;
    for (const LoggedLine& l : log.lines())
        if (l.level == VF_LOG_ERROR && l.text.find("'dump.") != std::string::npos)
            errors.push_back(l.text.substr(21));
    // The first dump lists bare only; the second both.
    EXPECT_EQ(std::vector<std::string>({"'dump.bare' " + hex(bare.key) + " ENUM <NO VALUES>",
                                        "'dump.bare' " + hex(bare.key) + " ENUM <NO VALUES>",
                                        "'dump.odd' " + hex(odd.key) + " INVALID TYPE (9)"}),
              errors);
}

// Registration, duplicates and clashes all log; none may hold the registry
// while doing so, as an application's log function may look options up. A
// deadlock cannot be undone: give up the process.
int gLookups = 0;
void lookingLog(int, const char*, ...) {
    if (VCOption_FindByName("reentrant.lookup") != nullptr) ++gLookups;
}

TEST(VcOptions, LogFunctionMayLookOptionsUp) {
    static VCOption_t option = makeOption("reentrant.lookup", VCOPTION_TYPE_STRING);
    static VCOption_t twin = makeOption("reentrant.lookup", VCOPTION_TYPE_STRING);
    static VCOption_t intruder = makeOption("reentrant.intruder", VCOPTION_TYPE_INTEGER);
    VF_LogMsg_t previous = VF_LogMsg;
    VF_LogMsg = lookingLog;
    gLookups = 0;
    std::promise<void> done;
    std::thread worker([&] {
        EXPECT_EQ(1, VCOption_RegisterNew(&option));
        EXPECT_EQ(1, VCOption_RegisterNew(&twin));
        intruder.key = option.key;
        EXPECT_EQ(0, VCOption_RegisterNew(&intruder));
        done.set_value();
    });
    if (done.get_future().wait_for(std::chrono::seconds(30)) != std::future_status::ready) {
        fprintf(stderr, "option registration deadlocked in its log function\n");
        _exit(1);
    }
    worker.join();
    VF_LogMsg = previous;
    EXPECT_GE(gLookups, 3);
}

TEST(VcOptions, ValueChecks) {
    VCOption_t unbounded = makeOption("u", VCOPTION_TYPE_INTEGER);
    VCOption_t orientation = makeOption("o", VCOPTION_TYPE_INTEGER, 0, 3);
    VCOption_t f = makeOption("f", VCOPTION_TYPE_FLOAT);
    VCOption_t bounded = makeOption("b", VCOPTION_TYPE_FLOAT);
    bounded.min.value.f = -0.5f;
    bounded.max.value.f = 0.5f;
    static const VCOptionEnum_t values[] = {{1, "front"}, {2, "back"}, {-1, "never"}};
    VCOption_t e = makeOption("e", VCOPTION_TYPE_ENUM);
    e.enumValues = values;
    VCOption_t s = makeOption("s", VCOPTION_TYPE_STRING);
    const struct {
        const VCOption_t* option;
        int i;
        float f;
        const char* s;  // the one kind checked: i unless f is not NaN, s when set
        int ok;
    } rows[] = {
        {&unbounded, -123456, NAN, nullptr, 1},
        {&orientation, 3, NAN, nullptr, 1},
        {&orientation, 0, NAN, nullptr, 1},
        {&orientation, 4, NAN, nullptr, 0},
        {&orientation, -1, NAN, nullptr, 0},
        {nullptr, 1, NAN, nullptr, 0},
        {&orientation, 0, 1.0f, nullptr, 0},  // wrong type
        {&f, 0, -1e9f, nullptr, 1},
        {&bounded, 0, 0.5f, nullptr, 1},
        {&bounded, 0, 0.51f, nullptr, 0},
        {&bounded, 0, -0.51f, nullptr, 0},
        {&bounded, 0, NAN, nullptr, 0},
        {nullptr, 0, 0.0f, nullptr, 0},
        {&s, 0, NAN, "anything", 1},
        {&e, 0, NAN, "back", 1},
        {&e, 0, NAN, "never", 0},  // the scan stops at the terminator
        {&e, 0, NAN, "Back", 0},
        {&orientation, 0, NAN, "1", 0},
        {nullptr, 0, NAN, "x", 0},
    };
    for (const auto& r : rows) {
        const int ok = r.s != nullptr     ? VCOption_CheckValueS(r.option, r.s)
                       : !std::isnan(r.f) ? VCOption_CheckValueF(r.option, r.f)
                                          : VCOption_CheckValueI(r.option, r.i);
        EXPECT_EQ(r.ok, ok) << (r.option ? r.option->name : "null") << " " << r.i << " " << r.f
                            << " " << (r.s ? r.s : "");
    }
}

TEST(VcOptions, ParameterStrings) {
    const struct {
        const char* text;
        const char* key;
        int value;
    } ints[] = {
        {"a=1,b=2", "b", 2},
        {"ab=5,b=2", "b", 7},  // first match only: "b=" inside "ab=" ends the
                               // search
        {"b=x", "b", 7},
        {nullptr, "b", 7},
        {"b=1", nullptr, 7},
        {"", "b", 7},
        {"b=", "b", 7},
        {"b=,c=3", "b", 7},
        {"x=1,b=-12,c=9", "b", -12},
        {"b=3.9", "b", 3},
    };
    for (const auto& r : ints)
        EXPECT_EQ(r.value, VCOption_ParseStringI(r.text, r.key, 7)) << (r.text ? r.text : "null");
    const struct {
        const char* text;
        const char* key;
        float value;
    } floats[] = {
        {"parameter=0.5", "parameter", 0.5f},         {"parameters=0.5", "parameter", 9.0f},
        {"a=1,intensity=-2.25", "intensity", -2.25f}, {"intensity=4,x=1.5", "intensity", 4.0f},
        {"intensity=abc", "intensity", 9.0f},
    };
    for (const auto& r : floats)
        EXPECT_FLOAT_EQ(r.value, VCOption_ParseStringF(r.text, r.key, 9.0f)) << r.text;
    // The caller's string is never modified.
    char text[] = "a=1,b=2";
    VCOption_ParseStringI(text, "a", 0);
    EXPECT_STREQ("a=1,b=2", text);
}

TEST(VcOptions, SortKeepsNamesParallel) {
    int keys[] = {5, -3, 9, 5, 0, 12, -7, 1};
    char names[8][256];
    for (int i = 0; i < 8; ++i) snprintf(names[i], 256, "name%d", keys[i]);
    sort(keys, names, 0, 7);
    for (int i = 0; i < 8; ++i) {
        EXPECT_LE(keys[i > 0 ? i - 1 : 0], keys[i]);
        EXPECT_EQ("name" + std::to_string(keys[i]), names[i]);
    }
    // A sub-range leaves the rest alone.
    int part[] = {4, 3, 2, 1};
    char partNames[4][256] = {"4", "3", "2", "1"};
    sort(part, partNames, 1, 2);
    EXPECT_EQ(std::vector<int>({4, 2, 3, 1}), std::vector<int>(part, part + 4));
    EXPECT_EQ("4231", std::string(partNames[0]) + partNames[1] + partNames[2] + partNames[3]);
    // Names are cut to 255 characters plus the terminator.
    int two[] = {2, 1};
    char longNames[2][256];
    memset(longNames[0], 'x', 255);
    longNames[0][255] = '\0';
    snprintf(longNames[1], 256, "short");
    swap(&two[0], &two[1], longNames[0], longNames[1]);
    EXPECT_EQ(1, two[0]);
    EXPECT_STREQ("short", longNames[0]);
    EXPECT_EQ(255u, strlen(longNames[1]));
}

TEST(VcOptions, ConcurrentRegistrationGivesDistinctKeys) {
    const int kThreads = 4, kPerThread = 50;
    static std::vector<std::string> names;
    static std::vector<VCOption_t> options(kThreads * kPerThread);
    for (int i = 0; i < kThreads * kPerThread; ++i) names.push_back("mt." + std::to_string(i));
    for (int i = 0; i < kThreads * kPerThread; ++i)
        options[i] = makeOption(names[i].c_str(), VCOPTION_TYPE_INTEGER);
    VF_LogMsg_t previous = VF_LogMsg;
    VF_LogMsg = quietLog;  // the dumps are quadratic; keep them quiet
    // Lookups by name meanwhile: the registry must be locked for them too.
    std::atomic<bool> done{false};
    std::thread reader([&] {
        while (!done) VCOption_FindByName("mt.0");
    });
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
        threads.emplace_back([t] {
            for (int i = 0; i < kPerThread; ++i)
                EXPECT_EQ(1, VCOption_RegisterNew(&options[t * kPerThread + i]));
        });
    for (auto& th : threads) th.join();
    done = true;
    reader.join();
    VF_LogMsg = previous;
    std::set<uint32_t> keys;
    for (const auto& o : options) keys.insert(o.key);
    EXPECT_EQ(static_cast<size_t>(kThreads * kPerThread), keys.size());
    for (const auto& o : options) EXPECT_EQ(&o, VCOption_FindById(o.key));
}

}  // namespace
