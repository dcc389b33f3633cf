/* A filter plug-in written in C with its virtual table laid out by hand, slot
 * by slot, as the Itanium C++ ABI places a class's virtual functions: the
 * library calls it through the C++ SDK header, so every call landing in the
 * right function proves the header's slot order. It records what it is
 * asked; tests read the record through the plug-in pointer. */
#ifndef KIV_TESTS_PLUGIN_STANDIN_H
#define KIV_TESTS_PLUGIN_STANDIN_H

#ifdef __cplusplus
extern "C" {
#endif

/* The SDK's GLInfo, field by field. */
typedef struct {
    const char* textureDirectory;
    const char* packageName;
    unsigned int programId;
    int textureUnit;
    int cameraWidth;
    int cameraHeight;
    int cameraWidth2;
    int cameraHeight2;
    int camera0GeometryType;
} StandinGLInfo;

enum {
    STANDIN_COMPILE_OK = 0,
    STANDIN_COMPILE_FAIL = 1,   /* returns -1 */
    STANDIN_COMPILE_NOLINK = 2, /* compiles a shader that cannot link */
};

enum {
    STANDIN_RELEASE_OK = 0,       /* hands back the two textures it made */
    STANDIN_RELEASE_NULL = 1,     /* a count of 2 with no array */
    STANDIN_RELEASE_ERROR = 2,    /* returns 7 */
    STANDIN_RELEASE_NEGATIVE = 3, /* a count of -1 */
};

#define STANDIN_MAX_CALLS 64

typedef struct {
    const void* const* vptr; /* the address point: slot 1 */
    /* Behaviour, set by Create from KIV_STANDIN_* or by the test afterwards. */
    int capabilities;
    int formats;
    int drawFlag;
    int compileMode;
    int releaseMode;
    int processResult;
    /* What the library did: slot numbers in call order, and arguments. */
    int calls[STANDIN_MAX_CALLS];
    int callCount;
    StandinGLInfo info;
    char textureDirectory[512];
    char packageName[256];
    int drawWidth, drawHeight, drawUpsideDown;
    int processWidth, processHeight, processFormat;
    char intOptionName[64];
    int intOptionValue;
    char textOptionName[64];
    char textOptionValue[256];
    unsigned int textures[2];
    unsigned int released[2];
} StandinPlugin;

#ifdef __cplusplus
}
#endif

#endif
