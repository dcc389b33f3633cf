/* See standin.h. Built three times: complete, without Destroy, without Create. */
#include "standin.h"

#include <GLES2/gl2.h>
#include <stdbool.h>
#include <stdlib.h>
#include <string.h>

#define EXPORT __attribute__((visibility("default")))

static void record(StandinPlugin* self, int slot) {
    if (self->callCount < STANDIN_MAX_CALLS) self->calls[self->callCount] = slot;
    self->callCount++;
}

static void copyText(char* out, size_t size, const char* text) {
    strncpy(out, text != NULL ? text : "(null)", size - 1);
    out[size - 1] = '\0';
}

static void destroyComplete(StandinPlugin* self) {
    record(self, 1);
}
static void destroyDeleting(StandinPlugin* self) {
    record(self, 2);
    free(self);
}
static const char* getName(StandinPlugin* self) {
    record(self, 3);
    return "Standin";
}
static const char* getDescription(StandinPlugin* self) {
    record(self, 4);
    return "records what it is asked";
}
static bool getDrawFlag(StandinPlugin* self) {
    record(self, 5);
    return self->drawFlag != 0;
}
static void setGLInfo(StandinPlugin* self, const StandinGLInfo* info) {
    record(self, 6);
    self->info = *info;
    copyText(self->textureDirectory, sizeof(self->textureDirectory), info->textureDirectory);
    copyText(self->packageName, sizeof(self->packageName), info->packageName);
}

static const char kNegative[] =
    "#extension GL_OES_EGL_image_external : require\n"
    "precision mediump float; uniform samplerExternalOES texSampler; varying highp vec2 "
    "v_texcoord; void main() { vec4 c = texture2D(texSampler, v_texcoord); gl_FragColor = "
    "vec4(1.0 - c.rgb, c.a); }";
/* Compiles, but reads a varying the vertex shader never writes. */
static const char kUnlinkable[] =
    "precision mediump float; varying highp vec3 v_missing; void main() { gl_FragColor = "
    "vec4(v_missing, 1.0); }";

static int compileFragmentShader(StandinPlugin* self, int reserved) {
    record(self, 7);
    if (reserved != 0 || self->compileMode == STANDIN_COMPILE_FAIL) return -1;
    const char* source = self->compileMode == STANDIN_COMPILE_NOLINK ? kUnlinkable : kNegative;
    GLuint shader = glCreateShader(GL_FRAGMENT_SHADER);
    glShaderSource(shader, 1, &source, NULL);
    glCompileShader(shader);
    GLint ok = 0;
    glGetShaderiv(shader, GL_COMPILE_STATUS, &ok);
    if (!ok) {
        glDeleteShader(shader);
        return -1;
    }
    return (int)shader;
}
static void onDrawFrame(StandinPlugin* self, int width, int height, bool upsideDown) {
    record(self, 8);
    self->drawWidth = width;
    self->drawHeight = height;
    self->drawUpsideDown = upsideDown;
    if (self->textures[0] == 0) {
        glGenTextures(2, self->textures);
        /* A generated name is a texture only once bound. */
        for (int i = 0; i < 2; i++) glBindTexture(GL_TEXTURE_2D, self->textures[i]);
        glBindTexture(GL_TEXTURE_2D, 0);
    }
}
static int process(StandinPlugin* self, const unsigned char* in, unsigned char* out, int width,
                   int height, int format) {
    record(self, 9);
    self->processWidth = width;
    self->processHeight = height;
    self->processFormat = format;
    size_t pixels = (size_t)width * (size_t)height;
    size_t size = (format == 1 || format == 2) ? 4 * pixels : (3 * pixels + 1) / 2;
    for (size_t i = 0; i < size; i++) out[i] = (unsigned char)(255 - in[i]);
    return self->processResult;
}
static int getCapabilities(StandinPlugin* self) {
    record(self, 10);
    return self->capabilities;
}
static int getSupportedFormats(StandinPlugin* self) {
    record(self, 11);
    return self->formats;
}
static void setOptionInt(StandinPlugin* self, const char* name, int value) {
    record(self, 12);
    copyText(self->intOptionName, sizeof(self->intOptionName), name);
    self->intOptionValue = value;
}
static void setOptionText(StandinPlugin* self, const char* name, const char* value) {
    record(self, 13);
    copyText(self->textOptionName, sizeof(self->textOptionName), name);
    copyText(self->textOptionValue, sizeof(self->textOptionValue), value);
}
static int releaseGL(StandinPlugin* self, unsigned int** textures, int* count) {
    record(self, 14);
    switch (self->releaseMode) {
        case STANDIN_RELEASE_NULL:
            *textures = NULL;
            *count = 2;
            return 0;
        case STANDIN_RELEASE_ERROR:
            return 7;
        case STANDIN_RELEASE_NEGATIVE:
            *textures = self->released;
            *count = -1;
            return 0;
        default:
            memcpy(self->released, self->textures, sizeof(self->released));
            memset(self->textures, 0, sizeof(self->textures));
            *textures = self->released;
            *count = self->released[0] != 0 ? 2 : 0;
            return 0;
    }
}

/* Offset to top and type information first; objects point past them. */
/* Unused in the build without Create. */
__attribute__((unused)) static const void* const kVtable[] = {
    NULL,
    NULL,
    (const void*)destroyComplete,
    (const void*)destroyDeleting,
    (const void*)getName,
    (const void*)getDescription,
    (const void*)getDrawFlag,
    (const void*)setGLInfo,
    (const void*)compileFragmentShader,
    (const void*)onDrawFrame,
    (const void*)process,
    (const void*)getCapabilities,
    (const void*)getSupportedFormats,
    (const void*)setOptionInt,
    (const void*)setOptionText,
    (const void*)releaseGL,
};

__attribute__((unused)) static int envInt(const char* name, int fallback) {
    const char* value = getenv(name);
    return value != NULL && value[0] != '\0' ? atoi(value) : fallback;
}

#ifndef STANDIN_NO_CREATE
EXPORT StandinPlugin* Create(void) {
    if (envInt("KIV_STANDIN_CREATE_NULL", 0)) return NULL;
    StandinPlugin* self = (StandinPlugin*)calloc(1, sizeof(StandinPlugin));
    self->vptr = &kVtable[2];
    self->capabilities = envInt("KIV_STANDIN_CAPS", 3);
    self->formats = envInt("KIV_STANDIN_FORMATS", 1 | 4);
    self->drawFlag = 1;
    return self;
}
#endif

#ifndef STANDIN_NO_DESTROY
EXPORT void Destroy(StandinPlugin* self) {
    free(self);
}
#endif
