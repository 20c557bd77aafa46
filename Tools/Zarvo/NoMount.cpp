// Stands for Mount.cpp where there is no libfuse.
#include "Tools/Zarvo/Run.h"
#include "Tools/Zarvo/Text.h"

int RunMount(const Run& run) {
    run.console.Say(MakeMessage("this zarvo was built without libfuse 3, and can't mount"));
    return kWrongUsage;
}
