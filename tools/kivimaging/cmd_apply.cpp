#include <errno.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <memory>
#include <set>

#include "args.h"
#include "cli.h"
#include "cli_log.h"
#include "core/KivDecodeAhead.h"
#include "effects.h"
#include "file_io.h"
#include "image_io.h"
#include "orientation.h"
#include "progress.h"
#include "runner.h"

namespace kivcli {
namespace {

const char kHelp[] =
    "Usage: kivimaging apply -e EFFECT [-p PARAMETERS] [-q QUALITY] INPUT... -o OUTPUT\n"
    "\n"
    "Applies one effect to JPEG or PNG pictures on the GPU.\n"
    "\n"
    "  -e, --effect EFFECT      an effect id (403), a class name (Negative, any case)\n"
    "                           or a filter-library name (\"package,libname.so\");\n"
    "                           'kivimaging effects' lists them\n"
    "  -p, --parameter TEXT     option string for adjustable effects, e.g. \"intensity=50\"\n"
    "                           or \"TE=40,SA=-60\"; 'kivimaging effects' lists the names\n"
    "  -o, --output PATH        the output file for one input; a folder for several\n"
    "                           inputs (created when missing), where each result keeps\n"
    "                           its input's file name\n"
    "  -q, --quality N          JPEG quality 1-100 (default 98)\n"
    "  -v, --verbose            show the library's log on standard error\n"
    "\n"
    "Beauty smooths the skin of a face given in the (upright) picture's pixels: its\n"
    "rectangle (y down), the frame it is measured in, an intensity 0-4 and the skin\n"
    "colours as 0xRRGGBB written in decimal (here 0x705040 to 0xFFE8D8):\n"
    "  kivimaging apply -e Beauty -p \"face=1,intensity=3,width=4000,height=3000,\n"
    "    left=1400,top=700,right=2600,bottom=2300,tonemin=7360576,tonemax=16771288\"\n"
    "    in.jpg -o out.jpg\n"
    "\n"
    "The output format follows the name's last extension: .png, .jpg or .jpeg\n"
    "(x.jpg.png is a PNG). JPEG inputs are turned upright as their EXIF\n"
    "orientation says. An existing output is replaced only once the new file is\n"
    "complete. A progress bar is shown when standard output is a terminal.\n"
    "Exit status: 0 all written, 1 a picture could not be read, processed or\n"
    "written (the others are still done), 2 bad arguments.\n";

const OptionSpec kOptions[] = {
    {'h', "help", false},     {'v', "verbose", false}, {'e', "effect", true},
    {'p', "parameter", true}, {'o', "output", true},   {'q', "quality", true},
};

bool isDirectory(const std::string& path) {
    struct stat st;
    return stat(path.c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

std::string baseName(const std::string& path) {
    size_t slash = path.find_last_of('/');
    return slash == std::string::npos ? path : path.substr(slash + 1);
}

std::string joinPath(const std::string& dir, const std::string& name) {
    if (!dir.empty() && dir.back() == '/') return dir + name;
    return dir + "/" + name;
}

// One job per input: where its result goes.
struct Job {
    std::string input;
    std::string output;
};

int planJobs(const std::vector<std::string>& inputs, const std::string& output,
             std::vector<Job>* jobs) {
    bool intoFolder = inputs.size() > 1 || isDirectory(output) || output.back() == '/';
    if (!intoFolder) {
        if (!imageWritableFormat(output)) {
            return usageError("apply", "the output name must end in .png, .jpg or .jpeg");
        }
        jobs->push_back({inputs[0], output});
        return kExitOk;
    }
    struct stat st;
    if (stat(output.c_str(), &st) == 0 && !S_ISDIR(st.st_mode)) {
        return usageError("apply", "with several inputs the output must be a folder, and '" +
                                       output + "' is a file");
    }
    std::set<std::string> names;
    for (const std::string& in : inputs) {
        std::string name = baseName(in);
        if (!imageWritableFormat(name)) name += ".png";
        if (!names.insert(name).second) {
            return usageError("apply", "two inputs would both be written to '" + name + "'");
        }
        jobs->push_back({in, joinPath(output, name)});
    }
    return kExitOk;
}

// Decoded rows of the first picture kept while the GPU side starts. That
// start leaves the decoder time for about twice this on a large picture,
// but every kept byte adds to the peak memory (the rows are still there
// when the GPU side takes memory of its own).
constexpr size_t kDecodeAheadBytes = 20 << 20;

// Whether a picture streams straight from its file: a regular file that
// starts like a picture and is upright as far as its first bytes tell.
bool streamsFromFile(const PictureFile& file) {
    const FileBytes& head = file.head();
    int orientation = 1;
    return file.regular() && head.size() >= 2 &&
           ((head[0] == 0xFF && head[1] == 0xD8) || (head[0] == 0x89 && head[1] == 'P')) &&
           orientationFromHead(head.data(), head.size(), file.headIsWhole(), &orientation) &&
           orientation == 1;
}

}  // namespace

int cmdApply(int argc, char** argv) {
    ParsedArgs args;
    std::string error;
    if (!parseArgs(argc, argv, 1, kOptions, sizeof(kOptions) / sizeof(kOptions[0]), &args,
                   &error)) {
        return usageError("apply", error);
    }
    if (args.has("help")) {
        fputs(kHelp, stdout);
        return kExitOk;
    }
    if (!args.has("effect")) return usageError("apply", "no effect given (-e)");
    if (args.positionals.empty()) return usageError("apply", "no input file given");
    std::string output = args.get("output");
    if (output.empty()) return usageError("apply", "no output given (-o)");
    int quality = kDefaultJpegQuality;
    if (args.has("quality") && !parseInt(args.get("quality"), 1, 100, &quality)) {
        return usageError("apply", "--quality must be a number from 1 to 100");
    }
    cliLogSetup(args.has("verbose"));

    EffectChoice effect;
    if (!effectResolve(args.get("effect"), &effect, &error)) return usageError("apply", error);

    std::vector<Job> jobs;
    int rc = planJobs(args.positionals, output, &jobs);
    if (rc != kExitOk) return rc;
    for (const Job& job : jobs) {
        if (fileSame(job.input, job.output)) {
            return usageError("apply", "'" + job.input + "' would be overwritten by its result");
        }
    }
    bool intoFolder = jobs.size() > 1 || output.back() == '/' || isDirectory(output);
    if (intoFolder && !isDirectory(output) && mkdir(output.c_str(), 0777) != 0) {
        return failure("cannot create the folder '" + output + "': " + strerror(errno));
    }

    // The first picture starts decoding while the GPU side starts (loading
    // the driver, the context, the program), with its kept rows bounded.
    PictureFile firstFile;
    std::string firstError;
    const bool firstOpened = firstFile.open(jobs[0].input, &firstError);
    std::unique_ptr<KivDecodeAhead> ahead;
    if (firstOpened && streamsFromFile(firstFile)) {
        ahead.reset(new KivDecodeAhead(firstFile.openReader(), kDecodeAheadBytes));
        if (!ahead->ok()) ahead.reset();
    }

    EffectRunner runner;
    if (!runner.open(&error) || !runner.select(effect, args.get("parameter"), &error)) {
        return failure(error);
    }
    if (args.has("parameter") && !runner.acceptsParameter()) {
        fprintf(stderr, "kivimaging: warning: %s takes no parameters; -p is ignored\n",
                effect.label.c_str());
    }

    // Pictures the GPU cannot take are refused from their header, before a
    // long decoding that could only end in a failed draw.
    // (Asked once a picture needs the whole-picture way: asking builds a program.)
    int maxSide = -1;
    int written = 0;
    ProgressBar bar(stdout, static_cast<int>(jobs.size()), jobs.size() > 1 && isatty(1));
    for (size_t i = 0; i < jobs.size(); i++) {
        const Job& job = jobs[i];
        bar.update(static_cast<int>(i), baseName(job.input).c_str());
        // The first picture's decoder, if nothing took it over.
        if (i == 1) ahead.reset();
        PictureFile otherFile;
        PictureFile& file = i == 0 ? firstFile : otherFile;
        if (i == 0 ? !firstOpened : !otherFile.open(job.input, &error)) {
            bar.finish();
            failure(i == 0 ? firstError : error);
            continue;
        }
        // Upright pictures stream band by band (regular files read as they
        // decode); a turned one is turned whole.
        const bool fromFile = streamsFromFile(file);
        FileBytes bytes;
        if (!fromFile && !fileReadPicture(job.input, &bytes, &error)) {
            bar.finish();
            failure(error);
            continue;
        }
        if (fromFile || orientationOfJpeg(bytes.data(), bytes.size()) == 1) {
            AtomicFile output;
            if (!output.open(job.output, &error)) {
                bar.finish();
                failure(error);
                continue;
            }
            const bool png = imageFileFormat(job.output) == ImageFileFormat::kPng;
            KivDecodeAhead* decoding = i == 0 ? ahead.get() : nullptr;
            EffectRunner::StreamResult streamed =
                fromFile ? runner.runStream(decoding != nullptr ? nullptr : file.openReader(),
                                            job.input, png, quality, &output, &error, decoding)
                         : runner.runStream(bytes, job.input, png, quality, &output, &error);
            // Done with, or unused when the picture takes the whole-picture way.
            ahead.reset();
            if (streamed == EffectRunner::STREAM_DONE && !output.commit(&error)) {
                streamed = EffectRunner::STREAM_FAILED;
            }
            if (streamed != EffectRunner::STREAM_UNSUITED) {
                if (streamed == EffectRunner::STREAM_DONE) {
                    written++;
                } else {
                    bar.finish();
                    failure(error);
                }
                continue;
            }
        }
        // The whole-picture way reads the whole file.
        if (fromFile && !fileReadPicture(job.input, &bytes, &error)) {
            bar.finish();
            failure(error);
            continue;
        }
        if (maxSide < 0) maxSide = runner.maxPictureSide();
        ImageHolder input(imageDecodeRgba(bytes, job.input, &error, maxSide));
        ImageHolder result(input.get() != nullptr ? runner.run(input.get(), &error) : nullptr);
        if (result.get() == nullptr || !imageSave(result.get(), job.output, quality, &error)) {
            bar.finish();
            failure(result.get() == nullptr && input.get() != nullptr
                        ? "'" + job.input + "': " + error
                        : error);
            continue;
        }
        written++;
    }
    bar.update(static_cast<int>(jobs.size()), "");
    bar.finish();

    if (jobs.size() == 1) {
        if (written == 1) printf("%s: %s\n", effect.label.c_str(), jobs[0].output.c_str());
    } else {
        printf("%s: %d of %zu pictures written to %s\n", effect.label.c_str(), written, jobs.size(),
               output.c_str());
    }
    return written == static_cast<int>(jobs.size()) ? kExitOk : kExitFailure;
}

}  // namespace kivcli
