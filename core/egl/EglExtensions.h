// The EGL and GL extension entry points that the library and the host layer
// call, looked up once per process (an entry the driver lacks is null), and
// whether a context or display offers an extension by name.
#ifndef CORE_EGL_EGLEXTENSIONS_H
#define CORE_EGL_EGLEXTENSIONS_H

#include <string.h>

#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <GLES2/gl2.h>
#include <GLES2/gl2ext.h>

struct EglExtensions {
    // Images over textures and native buffers, and what samples or renders them.
    PFNEGLCREATEIMAGEKHRPROC eglCreateImageKHR;
    PFNEGLDESTROYIMAGEKHRPROC eglDestroyImageKHR;
    PFNGLEGLIMAGETARGETTEXTURE2DOESPROC glEGLImageTargetTexture2DOES;
    PFNGLEGLIMAGETARGETRENDERBUFFERSTORAGEOESPROC glEGLImageTargetRenderbufferStorageOES;
    // Fences (EGL_KHR_fence_sync).
    PFNEGLCREATESYNCKHRPROC eglCreateSyncKHR;
    PFNEGLCLIENTWAITSYNCKHRPROC eglClientWaitSyncKHR;
    PFNEGLDESTROYSYNCKHRPROC eglDestroySyncKHR;
    // Texture storage in imported memory (GL_EXT_memory_object_fd).
    PFNGLCREATEMEMORYOBJECTSEXTPROC glCreateMemoryObjectsEXT;
    PFNGLDELETEMEMORYOBJECTSEXTPROC glDeleteMemoryObjectsEXT;
    PFNGLIMPORTMEMORYFDEXTPROC glImportMemoryFdEXT;
    PFNGLTEXSTORAGEMEM2DEXTPROC glTexStorageMem2DEXT;

    static const EglExtensions& get() {
        static const EglExtensions table = {
            entry<PFNEGLCREATEIMAGEKHRPROC>("eglCreateImageKHR"),
            entry<PFNEGLDESTROYIMAGEKHRPROC>("eglDestroyImageKHR"),
            entry<PFNGLEGLIMAGETARGETTEXTURE2DOESPROC>("glEGLImageTargetTexture2DOES"),
            entry<PFNGLEGLIMAGETARGETRENDERBUFFERSTORAGEOESPROC>(
                "glEGLImageTargetRenderbufferStorageOES"),
            entry<PFNEGLCREATESYNCKHRPROC>("eglCreateSyncKHR"),
            entry<PFNEGLCLIENTWAITSYNCKHRPROC>("eglClientWaitSyncKHR"),
            entry<PFNEGLDESTROYSYNCKHRPROC>("eglDestroySyncKHR"),
            entry<PFNGLCREATEMEMORYOBJECTSEXTPROC>("glCreateMemoryObjectsEXT"),
            entry<PFNGLDELETEMEMORYOBJECTSEXTPROC>("glDeleteMemoryObjectsEXT"),
            entry<PFNGLIMPORTMEMORYFDEXTPROC>("glImportMemoryFdEXT"),
            entry<PFNGLTEXSTORAGEMEM2DEXTPROC>("glTexStorageMem2DEXT"),
        };
        return table;
    }

    // Whether the current context's GL (needs a current context) or the
    // display's EGL lists the extension.
    static bool hasGl(const char* name) {
        return listed(reinterpret_cast<const char*>(glGetString(GL_EXTENSIONS)), name);
    }
    static bool hasEgl(EGLDisplay display, const char* name) {
        return listed(eglQueryString(display, EGL_EXTENSIONS), name);
    }

private:
    template <typename T>
    static T entry(const char* name) {
        return reinterpret_cast<T>(eglGetProcAddress(name));
    }
    // A whole name in a list separated by spaces.
    static bool listed(const char* list, const char* name) {
        const size_t length = strlen(name);
        for (const char* at = list; at != nullptr && (at = strstr(at, name)) != nullptr;
             at += length) {
            if ((at == list || at[-1] == ' ') && (at[length] == ' ' || at[length] == '\0')) {
                return true;
            }
        }
        return false;
    }
};

#endif
