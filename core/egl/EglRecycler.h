// Deferred deletion of GL objects. Objects dropped where the context may not
// be current (an effect being replaced, a destructor, another thread) are
// collected here and deleted in one batch on the GL thread: at the start of
// every EglProgram frame and when the recycler itself is destroyed.
#ifndef CORE_EGL_EGLRECYCLER_H
#define CORE_EGL_EGLRECYCLER_H

#include <utils/Mutex.h>
#include <utils/RefBase.h>
#include <utils/SortedVector.h>

class EglImage;
class EglShader;

class EglRecycler : public virtual android::RefBase {
public:
    EglRecycler();
    // Runs a last batch, so it must be destroyed on the GL thread.
    virtual ~EglRecycler();

    // Any thread. Name 0 and null pointers are ignored; an object that is
    // already pending is not added twice.
    void putTexture(unsigned int texture);
    void putProgram(unsigned int program);
    void putEglImage(const android::sp<EglImage>& image);
    void putEglShader(const android::sp<EglShader>& shader);

    // GL thread, context current: textures, programs, images, shaders.
    void recycle();

    // Pending counts (for diagnostics and tests).
    size_t pendingTextures() const;
    size_t pendingPrograms() const;
    size_t pendingEglImages() const;
    size_t pendingEglShaders() const;

    EglRecycler(const EglRecycler&) = delete;
    EglRecycler& operator=(const EglRecycler&) = delete;

private:
    void deleteTextures();
    void deletePrograms();
    void deleteEglImages();
    void deleteEglShaders();

    android::SortedVector<unsigned int> mTextureList;
    android::SortedVector<unsigned int> mGLProgramList;
    android::SortedVector<android::sp<EglImage> > mEglImageList;
    android::SortedVector<android::sp<EglShader> > mEglShaderList;
    mutable android::Mutex mLock;
};

#endif
