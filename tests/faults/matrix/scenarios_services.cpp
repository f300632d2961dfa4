// The loader of libraries and the store of options.
//
// SPDX-License-Identifier: MIT
#include <dlfcn.h>
#include <kel/services/arg_list.h>
#include <kel/services/load_library.h>

#include <cstring>
#include <set>
#include <string>
#include <vector>

#include "tests/faults/matrix/scenario.h"
#include "tests/support/fault.h"

namespace {

using namespace kel::test;

// --- the loader --------------------------------------------------------------------------------------

// A system in which every library exists, or none. Each handle is the name that opened it.
class LoaderScenario : public Scenario {
    void prepare() override {
        seams::dlopen.script([this](const char* file, int) -> void* {
            if (!_libraries_exist) return nullptr;
            return _open.insert(new std::string(file)).first.operator*();
        });
        seams::dlclose.script([this](void* handle) {
            std::string* const name = static_cast<std::string*>(handle);
            const bool known = _open.erase(name) == 1;
            if (known) delete name;
            return known ? 0 : 1;
        });
        seams::dlerror.script([] {
            static char text[] = "shared object not open";
            return text;
        });
        set_up();
    }
    virtual void set_up() {}

public:
    ~LoaderScenario() override {
        for (std::string* name : _open) delete name;
    }

    // The open libraries and those in the table must be the same ones.
    std::string left_over() override {
        const std::size_t kept = reinterpret_cast<Table*>(&_loader)->count();
        return kept == _open.size()
                   ? ""
                   : std::to_string(_open.size()) + " open, " + std::to_string(kept) + " kept";
    }

protected:
    typedef KELDictionary<CORBA_String_var, void*> Table;  // the loader's first field

    void load_unfaulted(const char* name) {
        const Armed scripted;
        _loader.Load(name);
    }

    void gives_open() {
        const Disarmed pause;
        std::string names;
        for (const std::string* name : _open) names += *name + " ";
        gives("%s", names.c_str());
    }

    bool _libraries_exist = true;
    KELLoadLibrary _loader;

private:
    std::set<std::string*> _open;
};

class LibraryIsLoaded : public LoaderScenario {
    void act() override {
        _loader.Load("alpha");
        gives_open();
    }
};
KEL_SCENARIO(LibraryIsLoaded).giving("libalpha_r.so ").and_retried();

class LibraryIsMissing : public LoaderScenario {
    void set_up() override { _libraries_exist = false; }
    void act() override {
        _loader.Load("alpha");
        gives_open();
    }
};
KEL_SCENARIO(LibraryIsMissing)
    .giving("")
    .printing("LoadLibrary failed for [alpha]: Exception: KELLoadLibrary::LoadError\n\n")
    .without_pairs();

class LibraryIsLoadedAlready : public LoaderScenario {
    void set_up() override { load_unfaulted("alpha"); }
    void act() override {
        _loader.Load("alpha");
        gives_open();
    }
};
KEL_SCENARIO(LibraryIsLoadedAlready).giving("libalpha_r.so ").and_retried();

class LibraryIsUnloaded : public LoaderScenario {
    void set_up() override { load_unfaulted("alpha"); }
    void act() override {
        _loader.Unload("libalpha_r.so");
        gives_open();
    }
};
KEL_SCENARIO(LibraryIsUnloaded).giving("").and_retried();

class LibrariesAreUnloaded : public LoaderScenario {
    void set_up() override {
        load_unfaulted("alpha");
        load_unfaulted("beta");
    }
    void act() override {
        _loader.UnloadAll();
        gives_open();
    }
};
KEL_SCENARIO(LibrariesAreUnloaded).giving("").and_retried();

// No library has the name that is tried first.
class LibraryForReal : public Scenario {
    void act() override {
        _loader.Load(KEL_MATRIX_PLUGIN);
        const KELDictionary<CORBA_String_var, void*>& table =
            *reinterpret_cast<KELDictionary<CORBA_String_var, void*>*>(&_loader);
        gives("%s", table.count() == 1 ? "loaded" : "");
    }

public:
    ~LibraryForReal() override { _loader.UnloadAll(); }

private:
    KELLoadLibrary _loader;
};
KEL_SCENARIO(LibraryForReal).giving("loaded");

class FirstLoader : public Scenario {
    void act() override { gives("%s", KELLoadLibrary::instance() != nullptr ? "made" : "null"); }
};
KEL_SCENARIO(FirstLoader).giving("made").in_a_fresh_process().and_retried();

// --- options -----------------------------------------------------------------------------------------

class OptionsAreTaken : public Scenario {
    void act() override {
        _list.argInit(_count, _arguments, "-Px");
        gives("%d left, %lu stored", _count, _list.getArgCount());
    }
    std::string state() override {
        std::string kept;
        for (int i = 0; i < _count; ++i) kept += std::string(_arguments[i]) + " ";
        return kept;
    }

    std::string _words[5] = {"program", "-PxName", "value of the name", "rest", "-PxFlag"};
    char* _arguments[6] = {&_words[0][0], &_words[1][0], &_words[2][0],
                           &_words[3][0], &_words[4][0], nullptr};
    int _count = 5;
    KELArgList _list;
};
KEL_SCENARIO(OptionsAreTaken).giving("2 left, 2 stored").and_retried();

class OptionScenario : public Scenario {
    void prepare() override { _list.putArgValue("PxName", "old"); }
    std::string state() override {
        char* const value = _list.getArgValue("PxName");
        const std::string text = value;
        CORBA::string_free(value);
        return text;
    }

protected:
    KELArgList _list;
};

class OptionIsLookedUp : public OptionScenario {
    void act() override {
        const bool there = _list.getArg("PxName") != 0;
        const CORBA_String_var value(_list.getArgValue("PxName"));
        gives("%d %s", there, value.in());
    }
};
KEL_SCENARIO(OptionIsLookedUp).giving("1 old").and_retried();

class OptionIsReplaced : public OptionScenario {
    void act() override { _list.putArgValue("PxName", "a longer value"); }
};
KEL_SCENARIO(OptionIsReplaced).and_retried();

class OptionsAreGivenUp : public Scenario {
    void prepare() override { _list->putArgValue("PxName", "value"); }
    void act() override { _list.reset(); }
    std::unique_ptr<KELArgList> _list = std::make_unique<KELArgList>();
};
KEL_SCENARIO(OptionsAreGivenUp);

}  // namespace
