// Checked GL and EGL calls, and the logging of the GL side.
//
// Every GL or EGL call of the GL runtime is wrapped in one of the macros below,
// so that an error is noticed right where it happens and logged with the
// statement's own text:
//
//   GL_CHECK(stmt)       runs stmt, then reads glGetError(). On an error logs
//                        "GL Error: 0x%04x '%s' - %s at %s:%i" (code, name,
//                        text of stmt, VC_SOURCE, line). True when no error.
//   EGL_CHECK(stmt)      runs stmt, then reads eglGetError(). On an error logs
//                        "EGL Error: 0x%04x '%s' - %s at %s:%i". True when no error.
//   EGL_CHECK_BOOL(stmt) for EGL calls that return an EGLBoolean: stmt is an
//                        expression yielding that boolean (the call itself or an
//                        assignment such as `result = eglInitialize(...)`). Also
//                        fails, and logs, when the value is not EGL_TRUE even if
//                        eglGetError() reports EGL_SUCCESS.
//   EGL_CLEAR_ERRORS()   drains stale EGL errors, logging each as
//                        "EGL Clearing error: 0x%04x '%s' at %s:%i"; not a failure.
//   GL_CLEAR_ERRORS()    the same for glGetError(): "GL Clearing error: ...".
//   EGL_GL_CLEAR_ERRORS() both, EGL first.
//
// The file using them defines VC_SOURCE (its path in the tree without
// extension, e.g. "core/egl/EglEnvironment") before the first use. The text
// logged is the macro argument as written in the source, so write the
// statement the way it should read in the log. A statement split over lines
// logs as one line (line breaks become single spaces; a space left right
// after "(" or before ")" by such a break is dropped).
//
// Example:
//   EGLBoolean result;
//   if (!EGL_CHECK_BOOL(result = eglInitialize(mEglDisplay, &majorVersion, &minorVersion)))
//       return VC_REPORT(VC_ERROR_UNKNOWN);
//   if (!GL_CHECK(glUseProgram(mProgramId))) return VC_REPORT(VC_ERROR_UNKNOWN);
#ifndef CORE_EGL_EGLCHECK_H
#define CORE_EGL_EGLCHECK_H

#include <EGL/egl.h>

// Symbolic name of a GL or EGL error code, whichever API produced it
// (0x0505 -> "GL_OUT_OF_MEMORY", 0x3000 -> "EGL_SUCCESS"); null for a code
// without a name.
const char* EglErrorName(int code);

// Reads glGetError(); logs and returns false when it is not GL_NO_ERROR.
bool EglCheck_gl(const char* statement, const char* source, int line);
// Reads eglGetError(); logs and returns false when it is not EGL_SUCCESS.
bool EglCheck_egl(const char* statement, const char* source, int line);
// As EglCheck_egl, and also fails when value is not EGL_TRUE.
bool EglCheck_eglBool(EGLBoolean value, const char* statement, const char* source, int line);

// Drain loops behind EGL_CLEAR_ERRORS / GL_CLEAR_ERRORS; return how many
// errors were pending.
int EglClear_eglErrors(const char* source, int line);
int EglClear_glErrors(const char* source, int line);
int EglClear_errors(const char* source, int line);

// Log function of the GL side. Lines go through VF_LogMsg (so a program that
// replaces it sees them); with the default Android sink they carry the tag
// "KivImaging::EGL".
void EglLog(int level, const char* format, ...) __attribute__((format(printf, 2, 3)));

#define GL_CHECK(stmt) ((void)(stmt), EglCheck_gl(#stmt, VC_SOURCE, __LINE__))
#define EGL_CHECK(stmt) ((void)(stmt), EglCheck_egl(#stmt, VC_SOURCE, __LINE__))
#define EGL_CHECK_BOOL(stmt) EglCheck_eglBool((stmt), #stmt, VC_SOURCE, __LINE__)
#define EGL_CLEAR_ERRORS() EglClear_eglErrors(VC_SOURCE, __LINE__)
#define GL_CLEAR_ERRORS() EglClear_glErrors(VC_SOURCE, __LINE__)
#define EGL_GL_CLEAR_ERRORS() EglClear_errors(VC_SOURCE, __LINE__)

#endif
