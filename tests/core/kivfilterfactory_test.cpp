// The effect factory: ids without an effect yield null, served ids report the
// agreed type, and the table mechanics work for ranges and other builders.
#include <gtest/gtest.h>

#include <map>
#include <memory>
#include <string>

#include "core/KivFilter.h"
#include "core/KivFilterFactory.h"
#include "support/log_capture.h"
#include "test_effects.h"

namespace {

TEST(KivFilterFactory, UnservedIdsYieldNullAndServedIdsReportTheirType) {
    LogCapture quiet;
    for (int id : {-1,  0,   199, 203, 205, 207, 211, 214, 399, 404, 405,  407, 409,
                   413, 418, 421, 423, 424, 437, 439, 448, 499, 509, 1999, 2001})
        EXPECT_EQ(std::unique_ptr<KivFilter>(KivFilter::create(id, nullptr)), nullptr) << id;
    // Served effects report their id, except these on purpose (processors
    // compare the reported type with a requested id), and start without images.
    const std::map<int, int> quirks = {{212, -1318387531 /* 0xB16B00B5 */}, {431, 432}, {435, 425}};
    int served = 0;
    for (int id = 0; id < 1000; ++id) {
        std::unique_ptr<KivFilter> f(KivFilterFactory::create(id, nullptr));
        if (!f) continue;
        ++served;
        EXPECT_EQ(f->getFilterType(), quirks.count(id) ? quirks.at(id) : id) << "id " << id;
        EXPECT_EQ(f->getValue(102, -7), -7) << "id " << id;
    }
    EXPECT_GT(served, 0);  // at least the pass-through look every processor falls back to
}

class NamedProbe : public ProbeEffect {
public:
    explicit NamedProbe(const char* name) : ProbeEffect(2000, name) {}
};
class MismatchedProbe : public ProbeEffect {
public:
    MismatchedProbe() : ProbeEffect(432) {}
};

TEST(KivFilterFactory, TableMechanics) {
    const KivFilterFactory::Entry table[] = {
        {431, 431, KivFilterFactory::make<MismatchedProbe>},  // reports 432
        {500, 508, KivFilterFactory::makeWithId<ProbeEffect>},
        {2000, 2000, KivFilterFactory::makeWithName<NamedProbe>},
        {500, 500, KivFilterFactory::make<MismatchedProbe>},  // shadowed by the range
        {600, 600, nullptr},                                  // no builder: serves nothing
    };
    const size_t n = sizeof(table) / sizeof(table[0]);
    std::unique_ptr<KivFilter> f(KivFilterFactory::createFrom(table, n, 431, nullptr));
    ASSERT_NE(f, nullptr);
    EXPECT_EQ(f->getFilterType(), 432);
    for (int id : {500, 504, 508}) {
        f.reset(KivFilterFactory::createFrom(table, n, id, nullptr));
        ASSERT_NE(f, nullptr) << id;
        EXPECT_EQ(f->getFilterType(), id);
    }
    for (int id : {430, 499, 509, 600}) {
        EXPECT_EQ(KivFilterFactory::createFrom(table, n, id, nullptr), nullptr) << id;
    }
    EXPECT_EQ(KivFilterFactory::createFrom(nullptr, 3, 431, nullptr), nullptr);
    char name[] = "com.example.pkg,libx.so";
    f.reset(KivFilterFactory::createFrom(table, n, 2000, name));
    ASSERT_NE(f, nullptr);
    EXPECT_STREQ(f->getPkgAndFileName(), name);
}

}  // namespace
