#include "core/KivFilterExternal.h"

#include <stdint.h>
#include <string.h>

#include <atomic>

#include "core/KivBuiltInFilterCatalog.h"
#include "core/KivFilterName.h"
#include "core/egl/EglCheck.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglRecycler.h"
#include "kivimaging/KivFilterPlugin.h"
#include "core/KivDevicePath.h"
#include "vccore/vc_error.h"
#include "vccore/vc_image.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/KivFilterExternal"

const char KivFilterExternal::kPreloadPackage[] = "com.kiv.android.filter";
const char KivFilterExternal::kPreloadLibraryDir[] = "/system/cameradata/preloadfilters/Lib/arm/";
const char KivFilterExternal::kDownloadLibraryDir[] = "/data/DownFilters/Lib/";
const char KivFilterExternal::kPreloadTextureDir[] = "/system/cameradata/preloadfilters/Tex/";
const char KivFilterExternal::kDownloadTextureDir[] = "/data/DownFilters/Tex/";

// Calls into a plug-in rely on its virtual table alone: its type information
// is its own (a separately loaded copy, or none when built without RTTI), so
// the sanitizer's dynamic-type check does not apply to them.
#if defined(__clang__) || (defined(__GNUC__) && __GNUC__ >= 8)
#define KIV_PLUGIN_CALLS __attribute__((no_sanitize("vptr")))
#else
#define KIV_PLUGIN_CALLS
#endif

namespace {

std::atomic<unsigned int> gFirstProgramId{0};
std::atomic<bool> gFirstProgramSet{false};

std::string devicePath(const char* path) {
    int length = KivPlatform_devicePath(path, nullptr, 0);
    if (length < 0) return std::string();
    std::string out(static_cast<size_t>(length) + 1, '\0');
    KivPlatform_devicePath(path, &out[0], out.size());
    out.resize(static_cast<size_t>(length));
    return out;
}

// The plug-in's format bit for an image format; 0 for formats it cannot take.
int formatBit(uint32_t format) {
    switch (format) {
        case VC_FORMAT_RGBA:
            return KIV_PLUGIN_FORMAT_RGBA;
        case VC_FORMAT_BGRA:
            return KIV_PLUGIN_FORMAT_BGRA;
        case VC_FORMAT_NV21:
            return KIV_PLUGIN_FORMAT_NV21;
        case VC_FORMAT_NV12:
            return KIV_PLUGIN_FORMAT_NV12;
        default:
            return 0;
    }
}

KIV_PLUGIN_CALLS const char* nameOf(KivFilterPlugin* plugin) {
    const char* name = plugin->getName();
    return name != nullptr ? name : "(null)";
}

}  // namespace

KivFilterExternal::KivFilterExternal(void* arg)
    : mCapabilities(0),
      mSupportedFormats(0),
      mCamera0GeometryType(0),
      mThirdPartyWrapper(nullptr),
      mTextureUnit(0),
      mCatalog(new KivBuiltInFilterCatalog(BUILT_IN_FILTER_3RDPARTY)),
      mHasName(false) {
    load(static_cast<const char*>(arg));
}

KIV_PLUGIN_CALLS void KivFilterExternal::load(const char* arg) {
    if (arg == nullptr) {
        EglLog(VF_LOG_ERROR,
               "Downloadable Filter: The argument does not look like a proper library "
               "filename: %4.4s",
               "(null)");
        return;
    }
    mHasName = true;
    mPkgAndFileName = arg;
    // Names come from applications (and from Java strings): never let one
    // break or forge a log line.
    const std::string printable = KivFilterName_printable(arg);
    EglLog(VF_LOG_DEBUG, "Downloadable Filter: mPkgAndFileName = %s", printable.c_str());

    KivFilterName name;
    KivFilterNameStatus status = KivFilterName_parse(arg, &name);
    if (status != KIV_FILTER_NAME_OK) {
        EglLog(VF_LOG_ERROR, "Downloadable Filter: refused the effect name \"%s\": %s",
               printable.c_str(), KivFilterName_reason(status));
        return;
    }
    mPkgName = name.package;
    mLibraryName = name.library;

    EglLog(VF_LOG_DEBUG, "KI_PRELOAD_PACKAGE_NAME = %s", kPreloadPackage);
    bool preload = mPkgName == kPreloadPackage;
    if (!preload) {
        mDotName = name.fileName();
        preload = mCatalog->getBuiltInFilterId(mDotName.c_str()) != -1;
    }
    const std::string folder = devicePath(preload ? kPreloadLibraryDir : kDownloadLibraryDir);
    mTextureDir = devicePath(preload ? kPreloadTextureDir : kDownloadTextureDir);
    mLibraryPath = folder + name.fileName();
    EglLog(VF_LOG_DEBUG,
           "Downloadable FilterL KivFilterExternal set libraryPath to %s, mPkgName = %s",
           mLibraryPath.c_str(), mPkgName.c_str());

    std::string error;
    if (!mLibrary.open(folder, name.fileName(), &error)) {
        EglLog(VF_LOG_ERROR, "Downloadable Filter: %s is not opened, %s", mLibraryPath.c_str(),
               error.c_str());
        return;
    }
    KivFilterPluginCreate create =
        reinterpret_cast<KivFilterPluginCreate>(mLibrary.symbol("Create", &error));
    if (create == nullptr) {
        EglLog(VF_LOG_ERROR, "Downloadable Filter: %s dlsym is fail with %s", mLibraryName.c_str(),
               error.c_str());
        return;
    }
    mThirdPartyWrapper = create();
    if (mThirdPartyWrapper == nullptr) {
        EglLog(VF_LOG_ERROR, "Downloadable Filter: Create() of %s returned null",
               mLibraryName.c_str());
        return;
    }
    EglLog(VF_LOG_INFO, "Downloadable Filter, mThirdPartyWrapper is loaded (%s)",
           nameOf(mThirdPartyWrapper));
    mCapabilities = mThirdPartyWrapper->getCapabilities();
    mSupportedFormats = mThirdPartyWrapper->getSupportedFormats();
}

KIV_PLUGIN_CALLS KivFilterExternal::~KivFilterExternal() {
    EglLog(VF_LOG_DEBUG, "Downloadable Filter, ~KivFilterExternal() : mThirdPartyWrapper = %p",
           static_cast<void*>(mThirdPartyWrapper));
    if (mThirdPartyWrapper != nullptr) {
        KivFilterPluginDestroy destroy =
            reinterpret_cast<KivFilterPluginDestroy>(mLibrary.symbol("Destroy", nullptr));
        if (destroy == nullptr) {
            EglLog(VF_LOG_ERROR, "Downloadable Filter, ~KivFilterExternal loadDestroy fail!");
            // The object's code lives in the library: it stays loaded, and
            // the object stays referenced, for the rest of the process.
            mLibrary.keepForever(mThirdPartyWrapper);
            mThirdPartyWrapper = nullptr;
            mCatalog.clear();
            return;
        }
        EglLog(VF_LOG_INFO, "Downloadable Filter, Destroy previous filter (%s)",
               nameOf(mThirdPartyWrapper));
        destroy(mThirdPartyWrapper);
        mThirdPartyWrapper = nullptr;
    }
    mLibrary.close();
    mCatalog.clear();
}

int KivFilterExternal::getFilterType() const {
    return FILTER_TYPE;
}

const char* KivFilterExternal::getPkgAndFileName() {
    return mHasName ? mPkgAndFileName.c_str() : nullptr;
}

const char* KivFilterExternal::getPluginName() const {
    return mThirdPartyWrapper != nullptr ? nameOf(mThirdPartyWrapper) : "";
}

unsigned int KivFilterExternal::getFirstProgramId() {
    return gFirstProgramId.load();
}

bool KivFilterExternal::checkSupportFormat(int format) const {
    const int bit = formatBit(static_cast<uint32_t>(format));
    return bit != 0 && (mSupportedFormats & bit) != 0;
}

KIV_PLUGIN_CALLS int KivFilterExternal::doEffect() {
    if (mThirdPartyWrapper == nullptr) {
        EglLog(VF_LOG_ERROR, "Downloadable Filter, mExtWrapper is null");
        return VC_REPORT(VC_ERROR_NULL_PARAM);
    }
    if ((mCapabilities & KIV_PLUGIN_CAP_CPU) == 0) return VC_REPORT(VC_ERROR_UNSUPPORTED);
    if (mInputImage == nullptr || mOutputImage == nullptr || mInputImage->data == nullptr ||
        mOutputImage->data == nullptr) {
        return VC_REPORT(VC_ERROR_NULL_PARAM);
    }
    // The plug-in writes as much as it reads: a smaller or differently laid
    // out output would be overrun.
    if (mOutputImage->width != mInputImage->width || mOutputImage->height != mInputImage->height ||
        mOutputImage->format != mInputImage->format) {
        return VC_REPORT(VC_ERROR_INVALID_SIZE);
    }
    // The input's own layout: a plug-in listing several formats must be told
    // the one its buffer is in.
    const int bit = formatBit(mInputImage->format) & mSupportedFormats;
    if (bit == 0) return VC_REPORT(VC_ERROR_UNSUPPORTED);
    return mThirdPartyWrapper->process(mInputImage->data, mOutputImage->data, mInputImage->width,
                                       mInputImage->height, bit);
}

KIV_PLUGIN_CALLS int KivFilterExternal::loadExtFragmentShader(EglProgram& program) {
    EglLog(VF_LOG_DEBUG, "Downloadable Filter, KivFilterExternal loadExtFragmentShader %p",
           static_cast<void*>(this));
    if (mThirdPartyWrapper == nullptr) {
        EglLog(VF_LOG_ERROR, "Downloadable Filter, mExtWrapper is null");
        return -1;
    }
    program.setDrawFlag(mThirdPartyWrapper->getDrawFlag());

    GLInfo info;
    info.mTextureDirectory = mTextureDir.c_str();
    info.mPackageName = mPkgName.c_str();
    info.mProgramId = program.getProgramID();
    info.mTextureUnit = program.getNextAvailableTexture();
    info.mCameraWidth = program.getCameraWidth();
    info.mCameraHeight = program.getCameraHeight();
    info.mCameraWidth2 =
        program.getCameraWidth2() < 1 ? program.getCameraWidth() : program.getCameraWidth2();
    info.mCameraHeight2 =
        program.getCameraHeight2() < 1 ? program.getCameraHeight() : program.getCameraHeight2();
    info.mCamera0GeometryType = program.getCameraGeometryType(0);
    mCamera0GeometryType = info.mCamera0GeometryType;
    EglLog(VF_LOG_ERROR, "Downloadable Filter, info.mCamera0GeometryType = %d",
           info.mCamera0GeometryType);

    if ((mCapabilities & KIV_PLUGIN_CAP_GL) == 0) return -1;
    int result = mThirdPartyWrapper->compileFragmentShader(0);
    if (result < 0) EglLog(VF_LOG_ERROR, "Downloadable Filter, compile fragment shader failed");
    mThirdPartyWrapper->setGLInfo(&info);
    return result;
}

KIV_PLUGIN_CALLS int KivFilterExternal::onDrawFrame(EglProgram& program) {
    bool unset = false;
    if (gFirstProgramSet.compare_exchange_strong(unset, true)) {
        gFirstProgramId.store(program.getProgramID());
    }
    program.resetAvailableTextures();
    mTextureUnit = program.getNextAvailableTexture();
    if (mThirdPartyWrapper == nullptr) {
        EglLog(VF_LOG_ERROR, "Downloadable Filter, mThirdPartyWrapper is null");
        return 1;
    }
    if ((mCapabilities & KIV_PLUGIN_CAP_GL) == 0) return VC_REPORT(VC_ERROR_UNSUPPORTED);
    const int type = program.getCameraGeometryType(0);
    if (type != mCamera0GeometryType) {
        EglLog(VF_LOG_INFO,
               "Downloadable Filter, Change GeometryType from %d to %d, upsideDown = %d",
               mCamera0GeometryType, type, program.getPreviewFlip() ? 1 : 0);
        mCamera0GeometryType = type;
        setOption("Camera0GeometryType", type);
    }
    mThirdPartyWrapper->onDrawFrame(program.getPreviewWidth(), program.getPreviewHeight(),
                                    program.getPreviewFlip());
    return 0;
}

KIV_PLUGIN_CALLS int KivFilterExternal::releaseGL(EglRecycler& recycler) {
    EglLog(VF_LOG_DEBUG, "Downloadable Filter, KivFilterExternal::releaseGL");
    if (mThirdPartyWrapper == nullptr) return 0;
    unsigned int* textures = nullptr;
    int count = 0;
    int result = mThirdPartyWrapper->releaseGL(&textures, &count);
    EglLog(VF_LOG_DEBUG, "Downloadable Filter, releaseGL ret = %d, &textures = %d, n = %d", result,
           static_cast<int>(reinterpret_cast<intptr_t>(textures)), count);
    if (result != 0) return result;
    if (count == 0) return 0;
    if (count < 0) return VC_REPORT(VC_ERROR_INVALID_PARAM);
    if (textures == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    for (int i = 0; i < count; ++i) recycler.putTexture(textures[i]);
    return 0;
}

KIV_PLUGIN_CALLS int KivFilterExternal::setOption(const char* name, int value) {
    if (mThirdPartyWrapper == nullptr || name == nullptr) return 0;
    mThirdPartyWrapper->setOption(name, value);
    return 1;
}

KIV_PLUGIN_CALLS int KivFilterExternal::setOption(const char* name, const char* value) {
    if (mThirdPartyWrapper == nullptr || name == nullptr || value == nullptr) return 0;
    mThirdPartyWrapper->setOption(name, value);
    return 1;
}
