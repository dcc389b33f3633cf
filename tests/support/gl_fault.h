// Driver failures on demand, and a count of GL objects, on the real GL of a
// test program. A program that calls these functions also gets the GL
// entry points below defined in itself (in place of the driver's, the way
// host/ stands in for eglInitialize); they pass every call on to the driver
// except while a fault is armed:
//  - glCreateProgram returns 0, as a driver out of program objects does;
//  - glReadPixels of more than one pixel is passed on with a negative width,
//    so that the driver itself records GL_INVALID_VALUE and writes nothing
//    (how a failed read-back of a whole picture looks to its caller); while
//    armed, host buffers made from then on copy through GL instead of sharing
//    their storage with the GPU, so that there is a read-back to fail;
//  - glDrawArrays draws nothing, as a draw that covers no pixel;
//  - eglMakeCurrent onto a surface fails.
// Counts are per process; arming replaces the previous count.
#ifndef KIV_TESTS_GL_FAULT_H
#define KIV_TESTS_GL_FAULT_H

void GlFault_failProgramCreations(int count);
// The first `after` picture reads from now on pass, the next `count` fail.
void GlFault_failPictureReads(int count, int after = 0);
void GlFault_skipDraws(int count);
// eglMakeCurrent of a context on a surface fails (EGL_BAD_SURFACE), as when
// a window has gone; unbinding (no context) is passed on. With a size, only
// calls onto surfaces of that size fail (to reach one surface of several).
void GlFault_failMakeCurrents(int count, int width = 0, int height = 0);

// GL objects (textures, framebuffers, renderbuffers, buffers, programs,
// shaders) made minus those deleted, by every context of the process since
// it started: a count that grows over repeated work means objects that
// died with their context, or live on, undeleted.
long GlFault_objectBalance();

#endif
