// Callbacks that main runs first and last. A registration is a static object that is in the list from its construction
// to its destruction.
//
//   static RegisterRuntimeInitializeAndCleanup gFontsInitAndCleanup(InitFonts, CleanupFonts, 10);
//   ...
//   RegisterRuntimeInitializeAndCleanup::ExecuteInitializations();   // in main, before its work
//   RegisterRuntimeInitializeAndCleanup::ExecuteCleanup();           // and after it
//
// Main thread only: there is no lock.
#pragma once

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Core/Types.h"

class RegisterRuntimeInitializeAndCleanup : private NonCopyable {
public:
    using CallbackFunction = void (*)(void* userData);

    // Registrations with lower orders are initialized earlier and cleaned up later. Either callback may be null.
    // callbackData is passed to both.
    RegisterRuntimeInitializeAndCleanup(CallbackFunction initCallback, CallbackFunction cleanupCallback,
                                        SInt32 sortOrder = 0, void* callbackData = nullptr);
    ~RegisterRuntimeInitializeAndCleanup();

    // Whether a is initialized before b: the lower order first, then the lower address.
    static bool Sort(const RegisterRuntimeInitializeAndCleanup* a, const RegisterRuntimeInitializeAndCleanup* b);

    // Runs the init callbacks of the registrations that are not initialized; a second call therefore has no effect.
    static void ExecuteInitializations();

    // Runs the cleanup callbacks of the initialized ones in reverse order. A second call has no effect.
    static void ExecuteCleanup();

private:
    static dynamic_array<RegisterRuntimeInitializeAndCleanup*> Collect(MemLabelId label);

    static RegisterRuntimeInitializeAndCleanup* s_LastRegistered; // the newest; null when there is none

    const SInt32 order;
    void* const userData;
    const CallbackFunction init;
    const CallbackFunction cleanup;
    bool initialized; // also without an init callback
    RegisterRuntimeInitializeAndCleanup* older;
    RegisterRuntimeInitializeAndCleanup* newer;
};
