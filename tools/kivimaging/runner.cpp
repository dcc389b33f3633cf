#include "runner.h"

#include <string.h>

#include "cli_log.h"
#include "core/KivFilter.h"
#include "core/VFilterBufferedProcessorImpl.h"
#include "core/egl/Platform.h"

namespace kivcli {

namespace {

constexpr int kPassThroughId = 400;

}  // namespace

EffectRunner::EffectRunner() {}

EffectRunner::~EffectRunner() {
    if (mProcessor != nullptr) {
        mProcessor->release();
        BufferedProcessor_Destroy(mProcessor);
    }
}

bool EffectRunner::open(std::string* error) {
    if (mProcessor != nullptr) return true;
    // create() is documented to return the implementation; the raw-buffer
    // entry points live there.
    mProcessor = static_cast<VFilterBufferedProcessorImpl*>(BufferedProcessor_Create());
    if (mProcessor == nullptr) {
        *error = "cannot create the buffered processor";
        return false;
    }
    mProcessor->initialize();
    return true;
}

bool EffectRunner::select(const EffectChoice& choice, const std::string& parameter,
                          std::string* error) {
    if (mProcessor == nullptr) {
        *error = "the processor is not open";
        return false;
    }
    if (choice.id >= 0) {
        mProcessor->setEffect(choice.id);
    } else {
        mProcessor->setEffect(choice.library.c_str());
    }
    KivFilter* effect = mProcessor->getEffect();
    if (effect == nullptr) {
        *error = "no effect could be created for '" + choice.label + "'";
        return false;
    }
    if (choice.id < 0 && effect->getFilterType() == kPassThroughId) {
        *error = "the filter library '" + choice.library + "' could not be loaded";
        return false;
    }
    if (!parameter.empty()) mProcessor->setEffectParameter(parameter.c_str());
    return true;
}

bool EffectRunner::acceptsParameter() const {
    KivFilter* effect = mProcessor != nullptr ? mProcessor->getEffect() : nullptr;
    const char* const* names = effect != nullptr ? effect->listOptionNames() : nullptr;
    for (int i = 0; names != nullptr && names[i] != nullptr; i++) {
        if (strcmp(names[i], "parameter") == 0) return true;
    }
    return false;
}

int EffectRunner::maxPictureSide() {
    if (mProcessor == nullptr) return 0;
    // The size is a GL query: it needs the processor's context current.
    int size = mProcessor->bindGLEnvironment() == 0 ? Platform::getMaximumTextureSize() : 0;
    mProcessor->unbindGLEnvironment();
    return size;
}

VCImage* EffectRunner::run(const VCImage* input, std::string* error) {
    if (mProcessor == nullptr || input == nullptr || input->data == nullptr ||
        input->format != VC_FORMAT_RGBA) {
        *error = "nothing to process";
        return nullptr;
    }
    VCImage* output = VCImage_createNew(input->width, input->height, VC_FORMAT_RGBA);
    if (output == nullptr) {
        *error = "out of memory for a " + std::to_string(input->width) + "x" +
                 std::to_string(input->height) + " picture";
        return nullptr;
    }
    // A failed draw or read-back still returns 0 and is visible only in the log.
    int errorsBefore = cliLogErrorCount();
    int rc = mProcessor->doProcessRGBA(input->data, input->width, input->height, output->data,
                                       VC_FORMAT_RGBA);
    if (rc != VC_OK || cliLogErrorCount() != errorsBefore) {
        *error = std::string("the effect could not be rendered (") +
                 (rc != VC_OK ? VCError_name(rc) : "see --verbose") + ")";
        VCImage_destroy(output);
        return nullptr;
    }
    return output;
}

}  // namespace kivcli
