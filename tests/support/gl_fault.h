// Driver failures on demand, on the real GL of a test program. A program that
// calls these functions also gets the two GL entry points below defined in
// itself (in place of the driver's, the way host/ stands in for eglInitialize);
// they pass every call on to the driver except while a fault is armed:
//  - glCreateProgram returns 0, as a driver out of program objects does;
//  - glReadPixels of more than one pixel is passed on with a negative width,
//    so that the driver itself records GL_INVALID_VALUE and writes nothing
//    (how a failed read-back of a whole picture looks to its caller); while
//    armed, host buffers made from then on copy through GL instead of sharing
//    their storage with the GPU, so that there is a read-back to fail.
// Counts are per process; arming replaces the previous count.
#ifndef KIV_TESTS_GL_FAULT_H
#define KIV_TESTS_GL_FAULT_H

void GlFault_failProgramCreations(int count);
void GlFault_failPictureReads(int count);

#endif
