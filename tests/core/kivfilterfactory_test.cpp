// The effect factory: ids without an effect yield null, ids that have one
// report the agreed type, and the table mechanics (ranges, first match,
// reported type independent of the id).
#include <gtest/gtest.h>

#include <map>
#include <memory>
#include <string>

#include "core/KivFilter.h"
#include "core/KivFilterFactory.h"
#include "support/log_capture.h"
#include "test_effects.h"
#include "vccore/vc_log.h"

namespace {

// What each served id's effect reports from getFilterType(). Where this
// differs from the id it does so on purpose: processors compare it with the
// requested id to decide whether an effect is already loaded.
const std::map<int, int> kReportedType = {
    {200, 200}, {201, 201}, {202, 202},
    {204, 204}, {206, 206}, {208, 208},
    {209, 209}, {210, 210}, {212, -1318387531 /* 0xB16B00B5 */},
    {213, 213}, {400, 400}, {401, 401},
    {402, 402}, {403, 403}, {406, 406},
    {408, 408}, {410, 410}, {411, 411},
    {412, 412}, {414, 414}, {415, 415},
    {416, 416}, {417, 417}, {422, 422},
    {425, 425}, {426, 426}, {427, 427},
    {428, 428}, {429, 429}, {430, 430},
    {431, 432}, {432, 432}, {433, 433},
    {434, 434}, {435, 425}, {436, 436},
    {440, 440}, {441, 441}, {442, 442},
    {443, 443}, {444, 444}, {445, 445},
    {446, 446}, {447, 447},
};

TEST(KivFilterFactory, IdsWithoutAnEffectYieldNull) {
    LogCapture log;
    for (int id : {-1,  0,   1,   199, 203, 205, 207, 211, 214, 399, 404, 405, 407, 409,  413,
                   418, 419, 420, 421, 423, 424, 437, 438, 439, 448, 499, 509, 510, 1999, 2001}) {
        std::unique_ptr<KivFilter> f(KivFilter::create(id, nullptr));
        EXPECT_EQ(f, nullptr) << id;
        char line[64];
        snprintf(line, sizeof(line), "Trying to instantiate effect %d", id);
        EXPECT_TRUE(log.contains(VF_LOG_DEBUG, line)) << id;
    }
}

TEST(KivFilterFactory, ServedIdsReportTheirType) {
    // Effects land in the table one family at a time; every one that is
    // there must report the agreed type and start clean.
    LogCapture log;
    int served = 0;
    for (const auto& [id, type] : kReportedType) {
        std::unique_ptr<KivFilter> f(KivFilterFactory::create(id, nullptr));
        if (!f) continue;
        ++served;
        EXPECT_EQ(f->getFilterType(), type) << "id " << id;
        EXPECT_EQ(f->getValue(102, -7), -7) << "id " << id;
        EXPECT_EQ(f->getValue(111, 7), f->supportsValueFlag() ? 0 : 7) << "id " << id;
    }
    // Curve looks: one class, constructed with the id.
    for (int id = 500; id <= 508; ++id) {
        std::unique_ptr<KivFilter> f(KivFilterFactory::create(id, nullptr));
        if (f) ++served;
    }
    RecordProperty("served_ids", served);
    if (served == 0) GTEST_SKIP() << "no effect class is in the factory table yet";
}

KivFilter* makeProbe(int id, void*) {
    return new ProbeEffect(id);
}
KivFilter* makeMismatched(int, void*) {
    return new ProbeEffect(432);
}
KivFilter* makeNamed(int id, void* arg) {
    return new ProbeEffect(id, static_cast<const char*>(arg));
}

TEST(KivFilterFactory, TableRowsAndRanges) {
    const KivFilterFactory::Entry table[] = {
        {431, 431, makeMismatched},  // reports another type than its id
        {500, 508, makeProbe},       // a range, built with the id itself
        {2000, 2000, makeNamed},     // built with the caller's argument
        {500, 500, makeMismatched},  // shadowed: the first matching row wins
        {0, -1, makeProbe},          // empty range serves nothing
        {600, 600, nullptr},         // a row without builder serves nothing
    };
    const size_t n = sizeof(table) / sizeof(table[0]);

    std::unique_ptr<KivFilter> brightness(KivFilterFactory::createFrom(table, n, 431, nullptr));
    ASSERT_NE(brightness, nullptr);
    EXPECT_EQ(brightness->getFilterType(), 432);

    for (int id : {500, 504, 508}) {
        std::unique_ptr<KivFilter> look(KivFilterFactory::createFrom(table, n, id, nullptr));
        ASSERT_NE(look, nullptr) << id;
        EXPECT_EQ(look->getFilterType(), id);
    }
    EXPECT_EQ(KivFilterFactory::createFrom(table, n, 499, nullptr), nullptr);
    EXPECT_EQ(KivFilterFactory::createFrom(table, n, 509, nullptr), nullptr);
    EXPECT_EQ(KivFilterFactory::createFrom(table, n, 0, nullptr), nullptr);
    EXPECT_EQ(KivFilterFactory::createFrom(table, n, 600, nullptr), nullptr);
    EXPECT_EQ(KivFilterFactory::createFrom(nullptr, 3, 431, nullptr), nullptr);

    char name[] = "com.example.pkg,libx.so";
    std::unique_ptr<KivFilter> external(KivFilterFactory::createFrom(table, n, 2000, name));
    ASSERT_NE(external, nullptr);
    EXPECT_STREQ(external->getPkgAndFileName(), name);
}

// Built from a name only, as the downloadable filter is.
class NamedProbe : public ProbeEffect {
public:
    explicit NamedProbe(const char* name) : ProbeEffect(2000, name) {}
};

TEST(KivFilterFactory, RowBuilders) {
    std::unique_ptr<KivFilter> plain(KivFilterFactory::make<ProbeEffect>(401, nullptr));
    EXPECT_EQ(plain->getFilterType(), 777);  // default construction ignores the id
    std::unique_ptr<KivFilter> withId(KivFilterFactory::makeWithId<ProbeEffect>(503, nullptr));
    EXPECT_EQ(withId->getFilterType(), 503);
    char name[] = "com.example.pkg,liby.so";
    std::unique_ptr<KivFilter> named(KivFilterFactory::makeWithName<NamedProbe>(2000, name));
    EXPECT_STREQ(named->getPkgAndFileName(), name);
}

}  // namespace
