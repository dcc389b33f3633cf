// An effect from a separately built filter library (a downloadable filter).
// The effect name "<package>,<library file>" locates the library in one of
// the two filter folders; the library's Create makes the plug-in object that
// draws, processes and takes options, through the interface of
// include/kivimaging/KivFilterPlugin.h. Without a plug-in (bad name, missing
// or refused library, no Create, Create returned null) the effect stays
// usable: GL drawing falls back to the program's pass-through and CPU
// processing is refused.
#ifndef KIV_CORE_KIVFILTEREXTERNAL_H
#define KIV_CORE_KIVFILTEREXTERNAL_H

#include <utils/RefBase.h>

#include <string>

#include "core/KivFilter.h"
#include "core/KivFilterLibrary.h"

class KivBuiltInFilterCatalog;
class KivFilterPlugin;

class KivFilterExternal : public KivFilter {
public:
    enum { FILTER_TYPE = 2000 };

    // arg: the effect name as a NUL-terminated text (may be null).
    explicit KivFilterExternal(void* arg);
    ~KivFilterExternal() override;

    int doEffect() override;
    int getFilterType() const override;
    int loadExtFragmentShader(EglProgram& program) override;
    // The effect name as given; null when none was.
    const char* getPkgAndFileName() override;
    int onDrawFrame(EglProgram& program) override;
    int releaseGL(EglRecycler& recycler) override;
    using KivFilter::setOption;
    // Forwarded to the plug-in; 1 (handled), or 0 without a plug-in.
    int setOption(const char* name, int value) override;
    int setOption(const char* name, const char* value) override;
    bool checkSupportFormat(int format) const override;

    bool hasPlugin() const { return mThirdPartyWrapper != nullptr; }
    // The plug-in object, for callers that talk to it directly; may be null.
    KivFilterPlugin* getPlugin() const { return mThirdPartyWrapper; }
    // The plug-in's name; "" without one.
    const char* getPluginName() const;
    int getCapabilities() const { return mCapabilities; }
    int getSupportedFormats() const { return mSupportedFormats; }
    // Where the library was looked for; "" when the name was refused.
    const std::string& getLibraryPath() const { return mLibraryPath; }

    // The first program any downloadable filter drew with in this process.
    static unsigned int getFirstProgramId();

    // Fixed names and folders (device paths; on a host under KIV_SYSROOT).
    static const char kPreloadPackage[];
    static const char kPreloadLibraryDir[];
    static const char kDownloadLibraryDir[];
    static const char kPreloadTextureDir[];
    static const char kDownloadTextureDir[];

private:
    void load(const char* arg);

    int mCapabilities;
    int mSupportedFormats;
    int mCamera0GeometryType;
    std::string mPkgName;
    // "<package>.<library>", only for packages other than the preload one.
    std::string mDotName;
    std::string mPkgAndFileName;
    KivFilterLibrary mLibrary;
    KivFilterPlugin* mThirdPartyWrapper;
    int mTextureUnit;
    android::sp<KivBuiltInFilterCatalog> mCatalog;

    bool mHasName;
    std::string mLibraryName;
    std::string mLibraryPath;
    std::string mTextureDir;
};

#endif
