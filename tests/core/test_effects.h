// Effects defined only for the tests: they record which hooks ran and let a
// test choose the answers of the overridable queries.
#ifndef KIV_TESTS_CORE_TEST_EFFECTS_H
#define KIV_TESTS_CORE_TEST_EFFECTS_H

#include <atomic>

#include "core/KivFilter.h"
#include "core/KivFilterOptions.h"

class ProbeEffect : public KivFilter {
public:
    explicit ProbeEffect(int type = 777, const char* pkg = nullptr) : mType(type), mPkg(pkg) {
        ++sLive;
    }
    ~ProbeEffect() override { --sLive; }

    int doEffect() override { return 0; }
    int getFilterType() const override { return mType; }
    const char* getPkgAndFileName() override { return mPkg; }
    void onInputImageSet() override { ++inputSetCalls; }
    void onInputFormatChanged() override { ++formatChangedCalls; }
    void onWorkImageChanged() override { ++workChangedCalls; }
    bool checkSupportFormat(int format) const override { return format != rejectedFormat; }
    bool needsWorkImage() const override { return wantsWorkImage; }
    bool supportsValueFlag() const override { return valueFlagSupported; }
    void kivImagingSetCallback(KivFilterCallback callback, void* context) override {
        mCallback = callback;
        mCallbackContext = context;
    }
    // Sends an event the way a picture-in-picture effect would.
    void report(const char* message) {
        if (mCallback != nullptr) mCallback(message, mCallbackContext);
    }

    const VCImage* workImage() const { return mWorkImage; }
    const VCImage* inputImage() const { return mInputImage; }
    const VCImage* outputImage() const { return mOutputImage; }

    int inputSetCalls = 0, formatChangedCalls = 0, workChangedCalls = 0, rejectedFormat = 0;
    bool wantsWorkImage = true, valueFlagSupported = true;
    static inline std::atomic<int> sLive{0};  // instances alive, to see deletions (any thread)

private:
    int mType;
    const char* mPkg;
    KivFilterCallback mCallback = nullptr;
    void* mCallbackContext = nullptr;
};

// Two options through the shared option pattern: a "parameter" string read as
// key=value pairs and an integer "kivtest_level" limited to 0…3.
class TwoOptionEffect : public KivFilterWithOptions<TwoOptionEffect, ProbeEffect> {
public:
    static KivFilterOptionTable& optionTable() {
        static VCOption_t records[] = {KivOption_string("parameter"),
                                       KivOption_int("kivtest_level", 0, 3)};
        static KivFilterOptionTable table(records);
        return table;
    }
    using KivFilter::getOption;
    using KivFilter::setOption;
    int setOption(const char* name, const char* value) override {
        const VCOption_t* option = matchOption(name);
        if (option == nullptr || option->type != VCOPTION_TYPE_STRING) return 0;
        intensity = VCOption_ParseStringF(value, "intensity", 1.0f);  // missing: neutral
        return 1;
    }
    int setOption(const char* name, int value) override {
        const VCOption_t* option = matchOption(name);
        if (option == nullptr || option->type != VCOPTION_TYPE_INTEGER) return 0;
        if (!VCOption_CheckValueI(option, value)) return 0;
        level = value;
        return 1;
    }
    VCOptionValue_t getOption(const char* name) const override {
        const VCOption_t* option = matchOption(name);
        if (option == nullptr || option->type != VCOPTION_TYPE_INTEGER)
            return KivFilter::getOption(name);
        VCOptionValue_t value{};
        value.type = VCOPTION_TYPE_INTEGER;
        value.value.i = level;
        return value;
    }
    float intensity = -1.0f;
    int level = 0;
};

// Declares a "parameter" STRING option of its own: must share the key.
class OneOptionEffect : public KivFilterWithOptions<OneOptionEffect, ProbeEffect> {
public:
    static KivFilterOptionTable& optionTable() {
        static VCOption_t records[] = {KivOption_string("parameter")};
        static KivFilterOptionTable table(records);
        return table;
    }
};

#endif
