#include "support/jvm.h"

#include <dlfcn.h>

#include <string>

namespace {

typedef jint (*CreateJavaVM_t)(JavaVM**, void**, void*);

JavaVM* gVm = nullptr;
JNIEnv* gEnv = nullptr;

std::string callString(JNIEnv* env, jobject object, const char* method) {
    jclass c = env->GetObjectClass(object);
    jmethodID m = env->GetMethodID(c, method, "()Ljava/lang/String;");
    env->DeleteLocalRef(c);
    if (m == nullptr) return "";
    jstring s = static_cast<jstring>(env->CallObjectMethod(object, m));
    if (s == nullptr) return "(null)";
    const char* chars = env->GetStringUTFChars(s, nullptr);
    std::string out = chars != nullptr ? chars : "";
    if (chars != nullptr) env->ReleaseStringUTFChars(s, chars);
    env->DeleteLocalRef(s);
    return out;
}

}  // namespace

JNIEnv* KivTestJvm_start(const char* libjvmPath, const char* classPath) {
    if (gEnv != nullptr) return gEnv;
    void* lib = dlopen(libjvmPath, RTLD_NOW | RTLD_GLOBAL);
    if (lib == nullptr) return nullptr;
    auto create = reinterpret_cast<CreateJavaVM_t>(dlsym(lib, "JNI_CreateJavaVM"));
    if (create == nullptr) return nullptr;
    std::string cp = std::string("-Djava.class.path=") + classPath;
    JavaVMOption options[3];
    options[0].optionString = const_cast<char*>(cp.c_str());
    // The test process keeps its own signal handlers as far as the VM allows.
    options[1].optionString = const_cast<char*>("-Xrs");
    options[2].optionString = const_cast<char*>("-Xmx256m");
    JavaVMInitArgs args;
    args.version = JNI_VERSION_1_8;
    args.nOptions = 3;
    args.options = options;
    args.ignoreUnrecognized = JNI_FALSE;
    void* env = nullptr;
    if (create(&gVm, &env, &args) != JNI_OK) return nullptr;
    gEnv = static_cast<JNIEnv*>(env);
    return gEnv;
}

std::string KivTestJvm_takeException(JNIEnv* env) {
    jthrowable t = env->ExceptionOccurred();
    if (t == nullptr) return "";
    env->ExceptionClear();
    jclass c = env->GetObjectClass(t);
    std::string name = callString(env, c, "getName");
    std::string message = callString(env, t, "getMessage");
    env->DeleteLocalRef(c);
    env->DeleteLocalRef(t);
    return name + ": " + message;
}
