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
#include "vccore/vc_log.h"

namespace {

// What each served id's effect reports from getFilterType(). Where it differs
// from the id it does so on purpose: processors compare it with a requested id.
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

TEST(KivFilterFactory, UnservedIdsYieldNull) {
    LogCapture log;
    for (int id : {-1,  0,   199, 203, 205, 207, 211, 214, 399, 404, 405,  407, 409,
                   413, 418, 421, 423, 424, 437, 439, 448, 499, 509, 1999, 2001}) {
        EXPECT_EQ(std::unique_ptr<KivFilter>(KivFilter::create(id, nullptr)), nullptr) << id;
        EXPECT_TRUE(
            log.contains(VF_LOG_DEBUG, "Trying to instantiate effect " + std::to_string(id)));
    }
}

TEST(KivFilterFactory, ServedIdsReportTheirType) {
    // Effects join the table family by family; each one present must report
    // the agreed type and start without images.
    int served = 0;
    for (const auto& [id, type] : kReportedType) {
        std::unique_ptr<KivFilter> f(KivFilterFactory::create(id, nullptr));
        if (!f) continue;
        ++served;
        EXPECT_EQ(f->getFilterType(), type) << "id " << id;
        EXPECT_EQ(f->getValue(102, -7), -7) << "id " << id;
    }
    RecordProperty("served_ids", served);
    if (served == 0) GTEST_SKIP() << "no effect class is in the factory table yet";
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
