// Runs effects over "RGBA" pictures through the library's buffered processor.
#ifndef TOOLS_KIVIMAGING_RUNNER_H
#define TOOLS_KIVIMAGING_RUNNER_H

#include <stdlib.h>

#include <memory>
#include <string>
#include <vector>

#include "effects.h"
#include "file_io.h"
#include "vccore/vc_image.h"

class KivDecodeAhead;
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

    // Renders a JPEG or PNG picture held in `bytes` band by band, straight
    // into an encoded PNG or JPEG (`quality`): the bytes run() and imageSave
    // would give for the picture as decoded, without it ever being whole in
    // memory. STREAM_DONE with *stream (malloc'ed) filled; STREAM_UNSUITED
    // when this picture or GPU needs the whole-picture path (nothing done);
    // STREAM_FAILED with a message (`path` names the input in it).
    enum StreamResult { STREAM_DONE, STREAM_UNSUITED, STREAM_FAILED };
    // `ahead`, when given, is `bytes` already being decoded.
    StreamResult runStream(const std::vector<unsigned char>& bytes, const std::string& path,
                           bool png, int quality, AtomicFile* output, std::string* error,
                           KivDecodeAhead* ahead = nullptr);
    // The same for a picture read as it decodes: `reader` (taken over, its
    // header not read) or, instead, `ahead` already decoding it.
    StreamResult runStream(VCStreamReader* reader, const std::string& path, bool png,
                           int quality, AtomicFile* output, std::string* error,
                           KivDecodeAhead* ahead = nullptr);

    EffectRunner(const EffectRunner&) = delete;
    EffectRunner& operator=(const EffectRunner&) = delete;

private:
    // Runs `process` (one of the processor's processStream calls) into
    // `output` and tells what came of it.
    template <typename Process>
    StreamResult stream(const Process& process, const std::string& path, bool png, int quality,
                        AtomicFile* output, std::string* error);

    VFilterBufferedProcessorImpl* mProcessor = nullptr;
};

}  // namespace kivcli

#endif
