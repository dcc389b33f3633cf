// Opens a downloadable filter's shared library from its folder, and only from
// there: the file is resolved (symbolic links included), must be a regular
// file directly inside the resolved folder, and is opened without following a
// link before the dynamic loader maps that very file.
#ifndef KIV_CORE_KIVFILTERLIBRARY_H
#define KIV_CORE_KIVFILTERLIBRARY_H

#include <string>

class KivFilterLibrary {
public:
    KivFilterLibrary() = default;
    // Unloads the library when still open.
    ~KivFilterLibrary();

    // Opens `folder` + `fileName` (folder ends in '/', fileName holds no '/').
    // On failure returns false with the reason in `error` (the loader's own
    // text when it refused the file) and opens nothing.
    bool open(const std::string& folder, const std::string& fileName, std::string* error);
    // The exported symbol, or null with the loader's text in `error`.
    void* symbol(const char* name, std::string* error) const;
    // Unloads the library; false with the loader's text when it refused.
    bool close(std::string* error = nullptr);
    // Leaves the library loaded for the rest of the process, with `object`,
    // something it made that cannot be freed, still referenced.
    void keepForever(void* object);

    bool isOpen() const { return mHandle != nullptr; }

    KivFilterLibrary(const KivFilterLibrary&) = delete;
    KivFilterLibrary& operator=(const KivFilterLibrary&) = delete;

private:
    void* mHandle = nullptr;
    // The descriptor the loader mapped the library through, kept open while
    // the library is loaded so that its /proc/self/fd name stays unique.
    int mFd = -1;
};

#endif
