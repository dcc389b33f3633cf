#include "runner.h"

#include <stdlib.h>
#include <string.h>

#include "cli_log.h"
#include "image_io.h"
#include "core/KivFilter.h"
#include "core/KivFilterExternal.h"
#include "core/VFilterBufferedProcessorImpl.h"
#include "core/egl/Platform.h"
#include "kivimaging/KivFilterPlugin.h"

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
    auto* external = dynamic_cast<KivFilterExternal*>(effect);
    if (choice.id < 0 && (effect->getFilterType() == kPassThroughId ||
                          (external != nullptr && !external->hasPlugin()))) {
        *error = "the filter library '" + choice.library + "' could not be loaded";
        return false;
    }
    if (!parameter.empty()) mProcessor->setEffectParameter(parameter.c_str());
    return true;
}

bool EffectRunner::acceptsParameter() const {
    KivFilter* effect = mProcessor != nullptr ? mProcessor->getEffect() : nullptr;
    // A plug-in takes the parameter string whatever its options are.
    if (dynamic_cast<KivFilterExternal*>(effect) != nullptr) return true;
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
    int rc = VC_OK;
    auto* external = dynamic_cast<KivFilterExternal*>(mProcessor->getEffect());
    if (external != nullptr && (external->getCapabilities() & KIV_PLUGIN_CAP_GL) == 0 &&
        (external->getCapabilities() & KIV_PLUGIN_CAP_CPU) != 0) {
        // A plug-in that only processes on the CPU: drawing would merely pass
        // the picture through.
        rc = external->setInputImage(input->data, input->width, input->height, VC_FORMAT_RGBA, 0);
        if (rc == VC_OK) {
            rc = external->setOutputImage(output->data, output->width, output->height,
                                          VC_FORMAT_RGBA, 0);
        }
        if (rc == VC_OK) rc = external->doEffect();
        external->setInputImage(nullptr, 0, 0, VC_FORMAT_RGBA, 0);
        external->setOutputImage(nullptr, 0, 0, VC_FORMAT_RGBA, 0);
    } else {
        rc = mProcessor->doProcessRGBA(input->data, input->width, input->height, output->data,
                                       VC_FORMAT_RGBA);
    }
    if (rc != VC_OK || cliLogErrorCount() != errorsBefore) {
        *error = std::string("the effect could not be rendered (") +
                 (rc < 0        ? VCError_name(rc)
                  : rc != VC_OK ? "the plug-in returned " + std::to_string(rc)
                                : std::string("see --verbose")) +
                 ")";
        VCImage_destroy(output);
        return nullptr;
    }
    return output;
}

EffectRunner::StreamResult EffectRunner::runStream(const std::vector<unsigned char>& bytes,
                                                   const std::string& path, bool png, int quality,
                                                   AtomicFile* output, std::string* error,
                                                   KivDecodeAhead* ahead) {
    return stream(
        [&](const VFilterBufferedProcessorImpl::StreamOutput& out, unsigned char** unused,
            size_t* length, VCDecodeFailure* why) {
            return mProcessor->processStream(bytes.data(), bytes.size(), false, out, unused,
                                             length, why, ahead);
        },
        path, png, quality, output, error);
}

EffectRunner::StreamResult EffectRunner::runStream(VCStreamReader* reader,
                                                   const std::string& path, bool png, int quality,
                                                   AtomicFile* output, std::string* error,
                                                   KivDecodeAhead* ahead) {
    if (mProcessor == nullptr) {
        VCStreamReader_close(reader);
        return STREAM_UNSUITED;
    }
    return stream(
        [&](const VFilterBufferedProcessorImpl::StreamOutput& out, unsigned char** unused,
            size_t* length, VCDecodeFailure* why) {
            return mProcessor->processStream(reader, false, out, unused, length, why, ahead);
        },
        path, png, quality, output, error);
}

template <typename Process>
EffectRunner::StreamResult EffectRunner::stream(const Process& process, const std::string& path,
                                                bool png, int quality, AtomicFile* output,
                                                std::string* error) {
    if (mProcessor == nullptr) return STREAM_UNSUITED;
    int errorsBefore = cliLogErrorCount();
    unsigned char* unused = nullptr;
    size_t length = 0;
    VCDecodeFailure why = VC_DECODE_OK;
    VFilterBufferedProcessorImpl::StreamOutput out = {png, quality};
    // Straight into the output's temporary file, from the encoder's thread.
    out.sink = [](void* file, const unsigned char* bytes, size_t n) {
        return static_cast<AtomicFile*>(file)->write(bytes, n) ? 0 : -1;
    };
    out.sinkUser = output;
    int rc = process(out, &unused, &length, &why);
    if (rc == VC_ERROR_UNSUPPORTED) return STREAM_UNSUITED;
    if (rc == 0 && cliLogErrorCount() == errorsBefore) return STREAM_DONE;
    if (why != VC_DECODE_OK) {
        *error = imageDecodeError(path, why);
    } else if (rc == VC_ERROR_CODEC_FAILED) {
        // A refused write stops the encoder: that is the story then.
        if (!output->writeFailed(error))
            *error = "'" + path + "': the picture could not be encoded";
    } else {
        *error = "'" + path + "': the effect could not be rendered (" +
                 (rc != VC_OK ? VCError_name(rc) : "see --verbose") + ")";
    }
    return STREAM_FAILED;
}

}  // namespace kivcli
