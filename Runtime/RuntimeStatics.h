// Static objects of the runtime that have no room of their own. They exist before the static objects of any program.
#pragma once

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Runtime/Utilities/RegisterRuntimeInitializeAndCleanup.h"

// What the process would be started again with; nothing fills it yet. The main thread's.
extern dynamic_array<core::string> relaunchArguments;

extern RegisterRuntimeInitializeAndCleanup gScriptingRandInitAndCleanup;
