// Turns effect ids into new effect objects. The ids served live in one table
// in KivFilterFactory.cpp: adding an effect is adding one row there.
#ifndef KIV_CORE_KIVFILTERFACTORY_H
#define KIV_CORE_KIVFILTERFACTORY_H

#include <stddef.h>

class KivFilter;

class KivFilterFactory {
public:
    // Builds one effect; id is the requested id (so a row can cover a range),
    // arg the caller's argument.
    typedef KivFilter* (*Creator)(int id, void* arg);

    // Serves the ids firstId…lastId inclusive. The id an effect reports from
    // getFilterType() is its class's business and may differ from the row's id.
    struct Entry {
        int firstId;
        int lastId;
        Creator create;
    };

    // A new effect owned by the caller (delete through the virtual
    // destructor), or null for an id no row serves.
    static KivFilter* create(int id, void* arg);

    // The lookup behind create(), over any table (the first matching row wins).
    static KivFilter* createFrom(const Entry* table, size_t count, int id, void* arg);

    // Row builders: plain construction, construction with the id, with arg
    // as the effect's name text, and with arg as it is.
    template <class T>
    static KivFilter* make(int, void*) {
        return new T();
    }
    template <class T>
    static KivFilter* makeWithId(int id, void*) {
        return new T(id);
    }
    template <class T>
    static KivFilter* makeWithName(int, void* arg) {
        return new T(static_cast<const char*>(arg));
    }
    template <class T>
    static KivFilter* makeWithArg(int, void* arg) {
        return new T(arg);
    }
};

#endif
