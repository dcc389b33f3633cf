/* A client of the installed library, in C (also compiled as C++): runs the
 * example Solarize plug-in over an RGBA buffer through the effect C API, swaps
 * the result to BGRA through the image core, and checks every byte against its
 * own computation. argv[1] is the effect name "<package>,<library file>". */
#include <stdio.h>
#include <string.h>

#include <kivimaging/KivImaging.h>
#include <kivimaging/vccore/vccore.h>
#ifdef __cplusplus
#include <kivimaging/VFilterBufferedProcessor.h>
#endif

#define W 13
#define H 7
#define BYTES (4 * W * H)
#define THRESHOLD 100

static int check(int ok, const char* what) {
    if (!ok) fprintf(stderr, "client: %s\n", what);
    return ok ? 0 : 1;
}

#ifdef __cplusplus
/* C++ clients also reach the offline processor, which makes its own EGL context. */
static int checkProcessor() {
    VFilterBufferedProcessor* processor = BufferedProcessor_Create();
    int bad = check(BufferedProcessor_GetVersion() == 3, "processor version");
    if (check(processor != NULL, "no processor")) return 1;
    bad |= check(processor->initialize() == 0, "processor initialize");
    bad |= check(processor->setEffect(400) == 0, "processor effect");
    bad |= check(processor->release() == 0, "processor release");
    BufferedProcessor_Destroy(processor);
    return bad;
}
#else
static int checkProcessor(void) {
    return 0;
}
#endif

int main(int argc, char** argv) {
    static unsigned char in[BYTES], out[BYTES], bgra[BYTES];
    int i, bad = 0;
    KivFilter* filter;
    VCImage *rgbaImage, *bgraImage;

    if (argc != 2) return check(0, "usage: client <package>,<library file>");
    for (i = 0; i < BYTES; i++) in[i] = (unsigned char)(i * 37 + 11);

    if (check(KivImaging_doEffect(NULL) == VC_ERROR_INVALID_PARAM, "null handle accepted"))
        return 1;
    filter = KivImaging_create(2000, argv[1]);
    if (check(filter != NULL, "the plug-in effect was not created")) return 1;
    bad |= check(KivImaging_supportsInputFormat(filter, (int)VC_FORMAT_RGBA) == 1, "RGBA refused");
    bad |= check(KivImaging_supportsInputFormat(filter, (int)VC_FORMAT_YV12) == 0, "YV12 accepted");
    bad |=
        check(KivImaging_setOptionByNameS(filter, "parameter", "threshold=100") == 1, "parameter");
    bad |= check(KivImaging_setInputImage(filter, in, W, H, (int)VC_FORMAT_RGBA, 0) == 0, "input");
    bad |=
        check(KivImaging_setOutputImage(filter, out, W, H, (int)VC_FORMAT_RGBA, 0) == 0, "output");
    bad |= check(KivImaging_init(filter) == 0, "init");
    bad |= check(KivImaging_doEffect(filter) == 0, "doEffect");
    for (i = 0; i < BYTES && !bad; i++) {
        unsigned char want = (unsigned char)(i % 4 == 3 || in[i] < THRESHOLD ? in[i] : 255 - in[i]);
        if (out[i] != want) {
            fprintf(stderr, "client: byte %d is %d, want %d\n", i, out[i], want);
            bad = 1;
        }
    }
    bad |= check(KivImaging_release(filter) == 0, "release");
    KivImaging_destroy(filter);

    rgbaImage = VCImage_createWrap(out, W, H, VC_FORMAT_RGBA, BYTES, 0);
    bgraImage = VCImage_createWrap(bgra, W, H, VC_FORMAT_BGRA, BYTES, 0);
    bad |= check(VCImage_convert(rgbaImage, bgraImage) == 0, "RGBA to BGRA");
    for (i = 0; i < BYTES && !bad; i++) {
        int source = i % 4 == 3 || i % 4 == 1 ? i : i ^ 2; /* R and B trade places */
        if (bgra[i] != out[source]) {
            fprintf(stderr, "client: BGRA byte %d is %d, want %d\n", i, bgra[i], out[source]);
            bad = 1;
        }
    }
    VCImage_destroy(rgbaImage);
    VCImage_destroy(bgraImage);
    bad |= checkProcessor();
    if (!bad) printf("client: %d pixels checked\n", W * H);
    return bad;
}
