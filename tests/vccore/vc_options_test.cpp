// kiv-test-labels: threads
// The option registry: keys, duplicates, clashes, the dump, value checks, the
// parameter-string parsers and the sort utility.
#include <gtest/gtest.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include <chrono>
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
    o.type = type;
    o.min.type = type;
    o.max.type = type;
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

// Position of a registered key in key order, counted without the dump: keys
// are handed out upwards from the base, and this suite sets none by hand
// that stays registered.
int indexOf(uint32_t key) {
    int index = 0;
    for (uint32_t k = VCOPTION_KEY_BASE + 1; k < key; ++k)
        if (VCOption_FindById(k) != nullptr) ++index;
    return index;
}

std::string dumpLine(uint32_t key, const std::string& rest) {
    char head[64];
    snprintf(head, sizeof(head), "OptionsRegister[%02d]: ", indexOf(key));
    return head + rest;
}

// A log function that looks options up, as an application's own may.
int gLookups = 0;
void lookingLog(int, const char*, ...) {
    if (VCOption_FindByName("reentrant.lookup") != nullptr) ++gLookups;
}

}  // namespace

// Declared first: gtest runs a file's tests in order, and the counter starts
// at its base only for the first registration of the process.
TEST(VcOptions, KeysCountUpFromTheBase) {
    static VCOption_t first = makeOption("keys.first", VCOPTION_TYPE_INTEGER);
    static VCOption_t second = makeOption("keys.second", VCOPTION_TYPE_FLOAT);
    LogCapture log;
    EXPECT_EQ(1, VCOption_RegisterNew(&first));
    EXPECT_EQ(1, VCOption_RegisterNew(&second));
    EXPECT_EQ(0x13370001u, first.key);
    EXPECT_EQ(0x13370002u, second.key);
    auto lines = log.lines();
    ASSERT_GE(lines.size(), 1u);
    EXPECT_EQ("DEBUG: Registering option 'keys.first' as key 0x13370001", lines[0].text);
    EXPECT_EQ(1, lines[0].level);
}

TEST(VcOptions, DuplicatesShareAKeyAndOnlyTheFirstIsRegistered) {
    static VCOption_t a = makeOption("parameter", VCOPTION_TYPE_STRING);
    static VCOption_t b = makeOption("parameter", VCOPTION_TYPE_STRING);
    static VCOption_t intOrientation = makeOption("orientation", VCOPTION_TYPE_INTEGER, 0, 3);
    static VCOption_t floatOrientation = makeOption("orientation", VCOPTION_TYPE_FLOAT);
    LogCapture log;
    ASSERT_EQ(1, VCOption_RegisterNew(&a));
    log.clear();
    ASSERT_EQ(1, VCOption_RegisterNew(&b));
    EXPECT_EQ(a.key, b.key);
    // No dump for a duplicate: one line only.
    auto lines = log.lines();
    ASSERT_EQ(1u, lines.size());
    EXPECT_EQ("DEBUG: Duplicate option found: 'parameter' with type 2. Key = " +
                  std::to_string(static_cast<int>(a.key)),
              lines[0].text);
    EXPECT_EQ(&a, VCOption_FindById(a.key));
    EXPECT_EQ(&a, VCOption_FindByName("parameter"));

    ASSERT_EQ(1, VCOption_RegisterNew(&intOrientation));
    ASSERT_EQ(1, VCOption_RegisterNew(&floatOrientation));
    EXPECT_NE(intOrientation.key, floatOrientation.key);
    // Lookup by name gives the first in key order.
    EXPECT_EQ(&intOrientation, VCOption_FindByName("orientation"));
    EXPECT_EQ(intOrientation.key, VCOption_FindIdByName("orientation"));
    EXPECT_STREQ("orientation", VCOption_FindNameById(floatOrientation.key));
    EXPECT_EQ(&floatOrientation, VCOption_FindById(floatOrientation.key));

    EXPECT_EQ(0u, VCOption_FindIdByName("no-such-option"));
    EXPECT_EQ(nullptr, VCOption_FindByName(nullptr));
    EXPECT_EQ(nullptr, VCOption_FindById(0x7fffffff));
    EXPECT_EQ(nullptr, VCOption_FindNameById(0));
    EXPECT_EQ(0, VCOption_RegisterNew(nullptr));
}

TEST(VcOptions, KeyClashIsRefused) {
    static VCOption_t owner = makeOption("clash.owner", VCOPTION_TYPE_INTEGER);
    static VCOption_t intruder = makeOption("clash.intruder", VCOPTION_TYPE_INTEGER);
    ASSERT_EQ(1, VCOption_RegisterNew(&owner));
    intruder.key = owner.key;
    LogCapture log;
    EXPECT_EQ(0, VCOption_RegisterNew(&intruder));
    ASSERT_EQ(1u, log.lines().size());
    EXPECT_TRUE(log.contains(
        4, "ERROR: Trying to register new option with an already existing key! [key = " +
               hex(owner.key) + "]"));
    EXPECT_EQ(&owner, VCOption_FindById(owner.key));
    EXPECT_EQ(nullptr, VCOption_FindByName("clash.intruder"));
}

TEST(VcOptions, RegistryDumpLines) {
    static const VCOptionEnum_t modes[] = {{0, "off"}, {5, "auto"}, {-1, nullptr}};
    static VCOption_t i = makeOption("dump.int", VCOPTION_TYPE_INTEGER, -2, 2000);
    static VCOption_t f = makeOption("dump.float", VCOPTION_TYPE_FLOAT);
    static VCOption_t e = makeOption("dump.enum", VCOPTION_TYPE_ENUM);
    static VCOption_t bare = makeOption("dump.bare", VCOPTION_TYPE_ENUM);
    static VCOption_t str = makeOption("dump.string", VCOPTION_TYPE_STRING);
    static VCOption_t odd = makeOption("dump.odd", static_cast<VCOptionType_t>(9));
    f.min.value.f = 0.25f;
    f.max.value.f = 1.5f;
    e.enumValues = modes;
    LogCapture log;
    for (VCOption_t* o : {&i, &f, &e, &bare, &str, &odd}) ASSERT_EQ(1, VCOption_RegisterNew(o));
    // Whole lines, index included.
    EXPECT_TRUE(
        log.contains(1, dumpLine(i.key, "'dump.int' " + hex(i.key) + " INTEGER -2 - 2000")));
    EXPECT_TRUE(log.contains(1, dumpLine(str.key, "'dump.string' " + hex(str.key) + " STRING")));
    // The last dump shows every entry; find each of ours by its text.
    auto has = [&](int level, const std::string& rest) {
        for (const auto& l : log.lines()) {
            if (l.level == level && l.text.size() > rest.size() &&
                l.text.compare(0, 16, "OptionsRegister[") == 0 &&
                l.text.compare(l.text.size() - rest.size(), rest.size(), rest) == 0)
                return true;
        }
        return false;
    };
    EXPECT_TRUE(has(1, "]: 'dump.float' " + hex(f.key) + " FLOAT 0.250000 - 1.500000"));
    EXPECT_TRUE(has(1, "]: 'dump.enum' " + hex(e.key) + " ENUM [0] off"));
    EXPECT_TRUE(has(1, "]: 'dump.enum' " + hex(e.key) + " ENUM [5] auto"));
    EXPECT_TRUE(has(4, "]: 'dump.bare' " + hex(bare.key) + " ENUM <NO VALUES>"));
    EXPECT_TRUE(has(4, "]: 'dump.odd' " + hex(odd.key) + " INVALID TYPE (9)"));
    // Indices are two-digit and in key order: the newest key is the last entry.
    std::vector<std::string> lastDump;
    for (const auto& l : log.texts()) {
        if (l.find("OptionsRegister[00]") == 0) lastDump.clear();
        if (l.find("OptionsRegister[") == 0) lastDump.push_back(l);
    }
    ASSERT_FALSE(lastDump.empty());
    EXPECT_NE(std::string::npos, lastDump.back().find("'dump.odd'"));
    // One index per entry (an enum prints a line per value under one index).
    std::set<std::string> indices;
    for (const auto& l : lastDump) indices.insert(l.substr(0, l.find(']')));
    char index[32];
    snprintf(index, sizeof(index), "OptionsRegister[%02d]", static_cast<int>(indices.size()) - 1);
    EXPECT_EQ(0u, lastDump.back().find(index));
}

TEST(VcOptions, LogFunctionMayLookOptionsUp) {
    static VCOption_t option = makeOption("reentrant.lookup", VCOPTION_TYPE_STRING);
    static VCOption_t twin = makeOption("reentrant.lookup", VCOPTION_TYPE_STRING);
    static VCOption_t intruder = makeOption("reentrant.intruder", VCOPTION_TYPE_INTEGER);
    VF_LogMsg_t previous = VF_LogMsg;
    VF_LogMsg = lookingLog;
    gLookups = 0;
    // Registration, duplicate and clash all log; none may hold the registry
    // while doing so. A deadlock cannot be undone: give up the process.
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
    // The dump logs one line per entry after the new option is in.
    EXPECT_GE(gLookups, 3);
}

TEST(VcOptions, ValueChecks) {
    VCOption_t unbounded = makeOption("u", VCOPTION_TYPE_INTEGER);
    VCOption_t orientation = makeOption("o", VCOPTION_TYPE_INTEGER, 0, 3);
    EXPECT_EQ(1, VCOption_CheckValueI(&unbounded, -123456));
    EXPECT_EQ(1, VCOption_CheckValueI(&orientation, 3));
    EXPECT_EQ(1, VCOption_CheckValueI(&orientation, 0));
    EXPECT_EQ(0, VCOption_CheckValueI(&orientation, 4));
    EXPECT_EQ(0, VCOption_CheckValueI(&orientation, -1));
    EXPECT_EQ(0, VCOption_CheckValueI(nullptr, 1));
    EXPECT_EQ(0, VCOption_CheckValueF(&orientation, 1.0f));  // wrong type

    VCOption_t f = makeOption("f", VCOPTION_TYPE_FLOAT);
    EXPECT_EQ(1, VCOption_CheckValueF(&f, -1e9f));
    f.min.value.f = -0.5f;
    f.max.value.f = 0.5f;
    EXPECT_EQ(1, VCOption_CheckValueF(&f, 0.5f));
    EXPECT_EQ(0, VCOption_CheckValueF(&f, 0.51f));
    EXPECT_EQ(0, VCOption_CheckValueF(&f, -0.51f));
    EXPECT_EQ(0, VCOption_CheckValueI(&f, 0));
    EXPECT_EQ(0, VCOption_CheckValueF(nullptr, 0.0f));

    static const VCOptionEnum_t values[] = {{1, "front"}, {2, "back"}, {-1, "never"}};
    VCOption_t e = makeOption("e", VCOPTION_TYPE_ENUM);
    e.enumValues = values;
    VCOption_t s = makeOption("s", VCOPTION_TYPE_STRING);
    EXPECT_EQ(1, VCOption_CheckValueS(&s, "anything"));
    EXPECT_EQ(1, VCOption_CheckValueS(&e, "back"));
    EXPECT_EQ(0, VCOption_CheckValueS(&e, "never"));  // the scan stops at the terminator
    EXPECT_EQ(0, VCOption_CheckValueS(&e, "Back"));
    EXPECT_EQ(0, VCOption_CheckValueS(&orientation, "1"));
    EXPECT_EQ(0, VCOption_CheckValueS(nullptr, "x"));
}

TEST(VcOptions, ParameterStrings) {
    EXPECT_EQ(2, VCOption_ParseStringI("a=1,b=2", "b", 7));
    // First match only: "b=" inside "ab=" ends the search.
    EXPECT_EQ(7, VCOption_ParseStringI("ab=5,b=2", "b", 7));
    EXPECT_EQ(7, VCOption_ParseStringI("b=x", "b", 7));
    EXPECT_EQ(7, VCOption_ParseStringI(nullptr, "b", 7));
    EXPECT_EQ(7, VCOption_ParseStringI("b=1", nullptr, 7));
    EXPECT_EQ(7, VCOption_ParseStringI("", "b", 7));
    EXPECT_EQ(7, VCOption_ParseStringI("b=", "b", 7));
    EXPECT_EQ(7, VCOption_ParseStringI("b=,c=3", "b", 7));  // cut at the comma: nothing to read
    EXPECT_EQ(-12, VCOption_ParseStringI("x=1,b=-12,c=9", "b", 7));
    EXPECT_EQ(3, VCOption_ParseStringI("b=3.9", "b", 7));
    EXPECT_FLOAT_EQ(0.5f, VCOption_ParseStringF("parameter=0.5", "parameter", 1.0f));
    EXPECT_FLOAT_EQ(1.0f, VCOption_ParseStringF("parameters=0.5", "parameter", 1.0f));
    EXPECT_FLOAT_EQ(-2.25f, VCOption_ParseStringF("a=1,intensity=-2.25", "intensity", 0.0f));
    EXPECT_FLOAT_EQ(4.0f, VCOption_ParseStringF("intensity=4,x=1.5", "intensity", 0.0f));
    EXPECT_FLOAT_EQ(9.0f, VCOption_ParseStringF("intensity=abc", "intensity", 9.0f));
    // The caller's string is never modified.
    char text[] = "a=1,b=2";
    VCOption_ParseStringI(text, "a", 0);
    EXPECT_STREQ("a=1,b=2", text);
}

TEST(VcOptions, SortKeepsNamesParallel) {
    int keys[] = {5, -3, 9, 5, 0, 12, -7, 1};
    const int n = sizeof(keys) / sizeof(keys[0]);
    char names[n][256];
    for (int i = 0; i < n; ++i) snprintf(names[i], 256, "name%d", keys[i]);
    sort(keys, names, 0, n - 1);
    for (int i = 0; i < n; ++i) {
        EXPECT_LE(keys[i > 0 ? i - 1 : 0], keys[i]);
        EXPECT_EQ("name" + std::to_string(keys[i]), names[i]);
    }
    // A sub-range leaves the rest alone.
    int part[] = {4, 3, 2, 1};
    char partNames[4][256] = {"4", "3", "2", "1"};
    sort(part, partNames, 1, 2);
    EXPECT_EQ(std::vector<int>({4, 2, 3, 1}), std::vector<int>(part, part + 4));
    EXPECT_STREQ("2", partNames[1]);
    EXPECT_STREQ("1", partNames[3]);

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
    names.clear();
    for (int i = 0; i < kThreads * kPerThread; ++i) names.push_back("mt." + std::to_string(i));
    for (int i = 0; i < kThreads * kPerThread; ++i)
        options[i] = makeOption(names[i].c_str(), VCOPTION_TYPE_INTEGER);
    VF_LogMsg_t previous = VF_LogMsg;
    VF_LogMsg = quietLog;  // the dumps are quadratic; keep them quiet
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) {
        threads.emplace_back([t] {
            for (int i = 0; i < kPerThread; ++i)
                EXPECT_EQ(1, VCOption_RegisterNew(&options[t * kPerThread + i]));
        });
    }
    for (auto& th : threads) th.join();
    VF_LogMsg = previous;
    std::set<uint32_t> keys;
    for (const auto& o : options) keys.insert(o.key);
    EXPECT_EQ(static_cast<size_t>(kThreads * kPerThread), keys.size());
    for (const auto& o : options) EXPECT_EQ(&o, VCOption_FindById(o.key));
}
