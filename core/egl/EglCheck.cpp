#include "core/egl/EglCheck.h"

#include <GLES2/gl2.h>
#include <android/log.h>
#include <stdarg.h>
#include <stdio.h>

#include "vccore/vc_log.h"

namespace {

const char kEglLogTag[] = "KivImaging::EGL";

// A lost context can report the same error forever; stop draining after this
// many so that a clearing loop cannot hang the GL thread.
const int kMaxDrain = 64;

struct ErrorName {
    int code;
    const char* name;
};

const ErrorName kErrorNames[] = {
    {0x0000, "GL_NO_ERROR"},           {0x0500, "GL_INVALID_ENUM"},
    {0x0501, "GL_INVALID_VALUE"},      {0x0502, "GL_INVALID_OPERATION"},
    {0x0505, "GL_OUT_OF_MEMORY"},      {0x0506, "GL_INVALID_FRAMEBUFFER_OPERATION"},
    {0x3000, "EGL_SUCCESS"},           {0x3001, "EGL_NOT_INITIALIZED"},
    {0x3002, "EGL_BAD_ACCESS"},        {0x3003, "EGL_BAD_ALLOC"},
    {0x3004, "EGL_BAD_ATTRIBUTE"},     {0x3005, "EGL_BAD_CONFIG"},
    {0x3006, "EGL_BAD_CONTEXT"},       {0x3007, "EGL_BAD_CURRENT_SURFACE"},
    {0x3008, "EGL_BAD_DISPLAY"},       {0x3009, "EGL_BAD_MATCH"},
    {0x300A, "EGL_BAD_NATIVE_PIXMAP"}, {0x300B, "EGL_BAD_NATIVE_WINDOW"},
    {0x300C, "EGL_BAD_PARAMETER"},     {0x300D, "EGL_BAD_SURFACE"},
    {0x300E, "EGL_CONTEXT_LOST"},
};

// The statement text as the source has it on one line: a statement that the
// formatter broke after an opening parenthesis stringifies as "f( a", so the
// space the line break left there (or before a closing one) is taken out.
class Statement {
public:
    explicit Statement(const char* text) {
        size_t n = 0;
        for (const char* p = text; *p != '\0' && n + 1 < sizeof(mText); p++) {
            if (*p == ' ' && n > 0 && mText[n - 1] == '(') continue;
            if (*p == ' ' && p[1] == ')') continue;
            mText[n++] = *p;
        }
        mText[n] = '\0';
    }
    const char* c_str() const { return mText; }

private:
    char mText[512];
};

}  // namespace

const char* EglErrorName(int code) {
    for (const ErrorName& e : kErrorNames) {
        if (e.code == code) return e.name;
    }
    return nullptr;
}

void EglLog(int level, const char* format, ...) {
    char line[2048];
    va_list args;
    va_start(args, format);
    vsnprintf(line, sizeof(line), format, args);
    va_end(args);
    if (VF_LogMsg == AndroidLogMsg) {
        // The default sink: same console line, but the GL side's own log tag.
        DefaultLogMsg(level, "%s", line);
        __android_log_write(VF_LogPriority(level), kEglLogTag, line);
    } else {
        VF_LogMsg(level, "%s", line);
    }
}

bool EglCheck_gl(const char* statement, const char* source, int line) {
    GLenum error = glGetError();
    if (error == GL_NO_ERROR) return true;
    const char* name = EglErrorName(static_cast<int>(error));
    EglLog(VF_LOG_ERROR, "GL Error: 0x%04x '%s' - %s at %s:%i", error, name ? name : "(null)",
           Statement(statement).c_str(), source, line);
    return false;
}

static bool logEglError(EGLint error, const char* statement, const char* source, int line) {
    const char* name = EglErrorName(error);
    EglLog(VF_LOG_ERROR, "EGL Error: 0x%04x '%s' - %s at %s:%i", error, name ? name : "(null)",
           Statement(statement).c_str(), source, line);
    return false;
}

bool EglCheck_egl(const char* statement, const char* source, int line) {
    EGLint error = eglGetError();
    if (error == EGL_SUCCESS) return true;
    return logEglError(error, statement, source, line);
}

bool EglCheck_eglBool(EGLBoolean value, const char* statement, const char* source, int line) {
    EGLint error = eglGetError();
    if (error == EGL_SUCCESS && value == EGL_TRUE) return true;
    return logEglError(error, statement, source, line);
}

int EglClear_eglErrors(const char* source, int line) {
    int count = 0;
    for (EGLint error = eglGetError(); error != EGL_SUCCESS && count < kMaxDrain;
         error = eglGetError()) {
        const char* name = EglErrorName(error);
        EglLog(VF_LOG_ERROR, "EGL Clearing error: 0x%04x '%s' at %s:%i", error,
               name ? name : "(null)", source, line);
        ++count;
    }
    return count;
}

int EglClear_glErrors(const char* source, int line) {
    int count = 0;
    for (GLenum error = glGetError(); error != GL_NO_ERROR && count < kMaxDrain;
         error = glGetError()) {
        const char* name = EglErrorName(static_cast<int>(error));
        EglLog(VF_LOG_ERROR, "GL Clearing error: 0x%04x '%s' at %s:%i", error,
               name ? name : "(null)", source, line);
        ++count;
    }
    return count;
}

int EglClear_errors(const char* source, int line) {
    int count = EglClear_eglErrors(source, line);
    return count + EglClear_glErrors(source, line);
}
