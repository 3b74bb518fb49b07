// A library that makes and destroys objects of a class with a pool of its own.
#include "parts_module.h"

const PartsModule partsModule = {
    [] { return new Rivet; },
    [](Rivet* rivet) { delete rivet; },
    &Rivet::Pool,
};
