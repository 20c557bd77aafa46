// Static objects of the runtime that belong to no other header. They exist before the static objects of any program.
#pragma once

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Runtime/Utilities/RegisterRuntimeInitializeAndCleanup.h"

// The arguments for starting the process again; nothing fills it yet. Main thread only.
extern dynamic_array<core::string> relaunchArguments;

extern RegisterRuntimeInitializeAndCleanup gScriptingRandInitAndCleanup;
