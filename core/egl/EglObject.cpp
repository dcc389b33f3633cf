#include "core/egl/EglObject.h"

EglObject::EglObject() : EglObject(0, 0) {}

EglObject::EglObject(int width, int height) : mWidth(width), mHeight(height) {
    pthread_mutex_init(&mMutex, nullptr);
}

EglObject::~EglObject() {
    pthread_mutex_destroy(&mMutex);
}

void EglObject::setSize(int width, int height) {
    mWidth = width;
    mHeight = height;
}

int EglObject::getWidth() {
    return mWidth;
}

int EglObject::getHeight() {
    return mHeight;
}

int EglObject::onDrawFrame() {
    return 0;
}

int EglObject::initialize() {
    pthread_mutex_lock(&mMutex);
    int result = initialize_l();
    pthread_mutex_unlock(&mMutex);
    return result;
}

void EglObject::release() {
    pthread_mutex_lock(&mMutex);
    release_l();
    pthread_mutex_unlock(&mMutex);
}

void EglObject::release_l() {}
