#include <stdio.h>

#include "args.h"
#include "cli.h"
#include "cli_log.h"
#include "image_io.h"
#include "sample_image.h"

namespace kivcli {
namespace {

const char kHelp[] =
    "Usage: kivimaging sample -o OUTPUT [--size WxH] [-q QUALITY]\n"
    "\n"
    "Writes the built-in test picture: eight colour bars on top; a grey ramp, a\n"
    "hue ramp, one-pixel stripes and a one-pixel checkerboard in the middle; a\n"
    "light and a dark skin-tone patch and red, green and blue ramps at the bottom.\n"
    "\n"
    "  -o, --output PATH   .png, .jpg or .jpeg\n"
    "      --size WxH      picture size (default 960x640, each side 64 to 8192)\n"
    "  -q, --quality N     JPEG quality 1-100 (default 98)\n"
    "  -v, --verbose       show the library's log on standard error\n";

const OptionSpec kOptions[] = {
    {'h', "help", false}, {'v', "verbose", false}, {'o', "output", true},
    {0, "size", true},    {'q', "quality", true},
};

}  // namespace

int cmdSample(int argc, char** argv) {
    ParsedArgs args;
    std::string error;
    if (!parseArgs(argc, argv, 1, kOptions, sizeof(kOptions) / sizeof(kOptions[0]), &args,
                   &error)) {
        return usageError("sample", error);
    }
    if (args.has("help")) {
        fputs(kHelp, stdout);
        return kExitOk;
    }
    if (!args.positionals.empty()) {
        return usageError("sample", "unexpected argument '" + args.positionals[0] + "'");
    }
    std::string output = args.get("output");
    if (output.empty()) return usageError("sample", "no output file given (-o)");
    if (!imageWritableFormat(output)) {
        return usageError("sample", "the output name must end in .png, .jpg or .jpeg");
    }
    int width = kSampleDefaultWidth, height = kSampleDefaultHeight;
    if (args.has("size") && !parseSize(args.get("size"), kSampleMinSize, 8192, &width, &height)) {
        return usageError("sample", "--size must be WxH with sides from 64 to 8192");
    }
    int quality = kDefaultJpegQuality;
    if (args.has("quality") && !parseInt(args.get("quality"), 1, 100, &quality)) {
        return usageError("sample", "--quality must be a number from 1 to 100");
    }
    cliLogSetup(args.has("verbose"));

    ImageHolder sample(sampleCreate(width, height));
    if (sample.get() == nullptr) return failure("out of memory for the sample picture");
    if (!imageSave(sample.get(), output, quality, &error)) return failure(error);
    printf("%s\n", output.c_str());
    return kExitOk;
}

}  // namespace kivcli
