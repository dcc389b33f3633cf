// A real Java VM embedded in a test program (OpenJDK's libjvm, opened at run
// time), so that JNI-typed operations run against genuine JNI semantics:
// arrays, strings, direct buffers, exceptions and Java classes.
#ifndef KIV_TESTS_JVM_H
#define KIV_TESTS_JVM_H

#include <jni.h>

#include <string>

// Starts the VM once per process (later calls return the same environment)
// with `classPath` as -Djava.class.path; null when libjvm cannot be loaded or
// the VM does not start. The environment belongs to the calling thread.
JNIEnv* KivTestJvm_start(const char* libjvmPath, const char* classPath);

// The pending Java exception as "<class name>: <message>" (cleared), or "" when
// there is none.
std::string KivTestJvm_takeException(JNIEnv* env);

#endif
