// Runs effects over "RGBA" pictures through the library's buffered processor.
#ifndef TOOLS_KIVIMAGING_RUNNER_H
#define TOOLS_KIVIMAGING_RUNNER_H

#include <string>

#include "effects.h"
#include "vccore/vc_image.h"

class VFilterBufferedProcessorImpl;

namespace kivcli {

class EffectRunner {
public:
    EffectRunner();
    // Releases the processor's GL objects, then the processor.
    ~EffectRunner();

    // Creates and initialises the processor (EGL context and pbuffer).
    bool open(std::string* error);
    // Selects an effect and hands it the parameter string when one is given.
    // Fails when a library name ended in the pass-through fallback.
    bool select(const EffectChoice& choice, const std::string& parameter, std::string* error);
    // Whether the selected effect has an option named "parameter" (the one
    // the parameter string goes to).
    bool acceptsParameter() const;
    // The longest picture side the GPU takes (its maximum texture size, as
    // the library's platform detection reads it); 0 when it cannot be asked.
    int maxPictureSide();
    // Renders `input` ("RGBA") into a new "RGBA" image of the same size.
    VCImage* run(const VCImage* input, std::string* error);

    EffectRunner(const EffectRunner&) = delete;
    EffectRunner& operator=(const EffectRunner&) = delete;

private:
    VFilterBufferedProcessorImpl* mProcessor = nullptr;
};

}  // namespace kivcli

#endif
