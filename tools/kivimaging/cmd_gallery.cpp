#include <stdio.h>
#include <unistd.h>

#include "args.h"
#include "cli.h"
#include "cli_log.h"
#include "contact_sheet.h"
#include "effects.h"
#include "file_io.h"
#include "image_io.h"
#include "progress.h"
#include "runner.h"
#include "sample_image.h"
#include "vccore/vc_geometry.h"

namespace kivcli {
namespace {

constexpr int kDefaultThumbWidth = 200;

const char kHelp[] =
    "Usage: kivimaging gallery [INPUT] -o OUTPUT [--thumb WIDTH] [--columns N]\n"
    "                          [-p PARAMETERS]\n"
    "\n"
    "Renders one picture through every effect the library serves and lays the\n"
    "results out as a contact sheet: a grid of thumbnails, each labelled\n"
    "\"<id> <class name>\". Without INPUT the built-in sample picture is used.\n"
    "\n"
    "  -o, --output PATH     .png (recommended), .jpg or .jpeg\n"
    "      --thumb WIDTH     thumbnail width, 16 to 1024 (default 200); the height\n"
    "                        follows the picture's aspect ratio\n"
    "      --columns N       thumbnails per row, 1 to 32 (default 6)\n"
    "  -p, --parameter TEXT  option string handed to every effect that takes\n"
    "                        parameters (the others are counted in a warning)\n"
    "  -v, --verbose         show the library's log on standard error\n"
    "\n"
    "Exit status: 0 the sheet was written (effects that failed to render are\n"
    "labelled FAILED and named on standard error), 1 the picture could not be\n"
    "read or the sheet not written, 2 bad arguments.\n";

const OptionSpec kOptions[] = {
    {'h', "help", false}, {'v', "verbose", false}, {'o', "output", true},
    {0, "thumb", true},   {0, "columns", true},    {'p', "parameter", true},
};

}  // namespace

int cmdGallery(int argc, char** argv) {
    ParsedArgs args;
    std::string error;
    if (!parseArgs(argc, argv, 1, kOptions, sizeof(kOptions) / sizeof(kOptions[0]), &args,
                   &error)) {
        return usageError("gallery", error);
    }
    if (args.has("help")) {
        fputs(kHelp, stdout);
        return kExitOk;
    }
    if (args.positionals.size() > 1) {
        return usageError(
            "gallery", "one input picture at most ('" + args.positionals[1] + "' is one too many)");
    }
    std::string output = args.get("output");
    if (output.empty()) return usageError("gallery", "no output file given (-o)");
    if (!imageWritableFormat(output)) {
        return usageError("gallery", "the output name must end in .png, .jpg or .jpeg");
    }
    int thumbWidth = kDefaultThumbWidth, columns = kSheetDefaultColumns;
    if (args.has("thumb") && !parseInt(args.get("thumb"), 16, 1024, &thumbWidth)) {
        return usageError("gallery", "--thumb must be a width from 16 to 1024");
    }
    if (args.has("columns") && !parseInt(args.get("columns"), 1, 32, &columns)) {
        return usageError("gallery", "--columns must be a number from 1 to 32");
    }
    if (!args.positionals.empty() && fileSame(args.positionals[0], output)) {
        return usageError(
            "gallery", "'" + args.positionals[0] + "' would be overwritten by the contact sheet");
    }
    cliLogSetup(args.has("verbose"));

    ImageHolder picture(args.positionals.empty()
                            ? sampleCreate(kSampleDefaultWidth, kSampleDefaultHeight)
                            : imageLoadRgba(args.positionals[0], &error));
    if (picture.get() == nullptr) {
        return failure(args.positionals.empty() ? "out of memory for the sample picture" : error);
    }

    std::vector<EffectInfo> effects = effectList();
    int thumbHeight = sheetThumbHeight(picture.get()->width, picture.get()->height, thumbWidth);
    SheetLayout layout;
    if (effects.empty() ||
        !sheetLayout(static_cast<int>(effects.size()), thumbWidth, thumbHeight, columns, &layout)) {
        return failure(effects.empty() ? "the library serves no effect"
                                       : "the contact sheet would be too large");
    }
    // Effects run on the thumbnail itself: the sheet shows them at thumbnail
    // scale anyway, and small draws keep a software GL quick.
    ImageHolder thumb(VCImage_createNew(thumbWidth, thumbHeight, VC_FORMAT_RGBA));
    ImageHolder sheet(sheetCreate(layout));
    if (thumb.get() == nullptr || sheet.get() == nullptr) return failure("out of memory");
    int rc = VCImage_scale(picture.get(), thumb.get());
    if (rc != VC_OK)
        return failure(std::string("cannot scale the picture (") + VCError_name(rc) + ")");

    EffectRunner runner;
    if (!runner.open(&error)) return failure(error);
    std::string parameter = args.get("parameter");
    std::vector<std::string> failed;
    int withoutParameters = 0;
    ProgressBar bar(stdout, layout.count, isatty(1));
    for (int i = 0; i < layout.count; i++) {
        const EffectInfo& e = effects[i];
        std::string label = std::to_string(e.id) + " " + e.className;
        bar.update(i, label.c_str());
        EffectChoice choice;
        choice.id = e.id;
        choice.label = label;
        bool selected = runner.select(choice, parameter, &error);
        if (selected && !parameter.empty() && !runner.acceptsParameter()) withoutParameters++;
        ImageHolder rendered(selected ? runner.run(thumb.get(), &error) : nullptr);
        if (rendered.get() == nullptr) {
            failed.push_back(label + ": " + error);
            // The cell keeps the background; the label says what happened.
            Rect where = sheetLabelRect(layout, i);
            fontDrawText(sheet.get(), where.x, where.y, (label + " FAILED").c_str(),
                         kSheetLabelColour, 1);
            continue;
        }
        rc = sheetPlace(sheet.get(), layout, i, rendered.get(), label.c_str());
        if (rc != VC_OK) failed.push_back(label + ": cannot paste the thumbnail");
    }
    bar.update(layout.count, "");
    bar.finish();

    if (withoutParameters > 0) {
        fprintf(stderr,
                "kivimaging: warning: %d of %d effects take no parameters; -p is ignored "
                "by them\n",
                withoutParameters, layout.count);
    }
    if (!imageSave(sheet.get(), output, kDefaultJpegQuality, &error)) return failure(error);
    for (const std::string& f : failed) fprintf(stderr, "kivimaging: effect %s\n", f.c_str());
    printf("gallery: %d effects (%d failed), %dx%d, written to %s\n", layout.count,
           static_cast<int>(failed.size()), layout.width, layout.height, output.c_str());
    return kExitOk;
}

}  // namespace kivcli
