// Common base of the GL-side objects that own GL or EGL resources.
//
// Resources are created by initialize() and freed by release(), both on the
// thread that has the context current; the destructor frees nothing. The two
// calls are serialised by the object's mutex, and subclasses do their work in
// initialize_l() / release_l(), which run with the mutex held.
#ifndef CORE_EGL_EGLOBJECT_H
#define CORE_EGL_EGLOBJECT_H

#include <pthread.h>
#include <utils/RefBase.h>

class EglObject : public virtual android::RefBase {
public:
    EglObject();
    EglObject(int width, int height);
    virtual ~EglObject();

    virtual void setSize(int width, int height);
    virtual int getWidth();
    virtual int getHeight();
    // Per-frame hook; nothing to do by default.
    virtual int onDrawFrame();

    // Lock, initialize_l(), unlock; returns its result.
    int initialize();
    // Lock, release_l(), unlock.
    void release();

    EglObject(const EglObject&) = delete;
    EglObject& operator=(const EglObject&) = delete;

protected:
    virtual void release_l();
    virtual int initialize_l() = 0;

    int mWidth;
    int mHeight;
    pthread_mutex_t mMutex;
};

#endif
