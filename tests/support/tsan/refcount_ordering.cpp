// Linked into the ThreadSanitizer builds of the test programs only.
//
// Debian's libutils is not instrumented, so ThreadSanitizer cannot see how its
// atomic reference count orders things: every earlier owner's last use of an
// object comes before the destructor that the thread dropping the last strong
// reference runs. Without that it reports each such destructor as a race with
// whatever the other owners did before letting go (a buffer unlocked by an
// encoder thread and freed by the producer, a worker thread object destroyed
// by the worker itself). These definitions take the place of libutils' own
// (the programs export them, so libutils and our libraries bind here too):
// every strong release is a release, and the last one acquires before the
// object is destroyed, exactly the ordering the atomic count gives.
#include <dlfcn.h>
#include <sanitizer/tsan_interface.h>
#include <utils/RefBase.h>

#include <cstdio>
#include <cstdlib>

namespace android {

void RefBase::decStrong(const void* id) const {
    using Real = void (*)(const RefBase*, const void*);
    static const Real real = [] {
        Real found = reinterpret_cast<Real>(dlsym(RTLD_NEXT, "_ZNK7android7RefBase9decStrongEPKv"));
        if (found == nullptr) {
            std::fprintf(stderr, "tsan: libutils' RefBase::decStrong not found\n");
            std::abort();
        }
        return found;
    }();
    __tsan_release(const_cast<RefBase*>(this));
    real(this, id);
}

// Called by libutils once the count reached zero, before the object goes.
// Classes overriding it call this one as well.
void RefBase::onLastStrongRef(const void*) {
    __tsan_acquire(this);
}

}  // namespace android
