#include "Runtime/Utilities/RegisterRuntimeInitializeAndCleanup.h"

#include <algorithm>
#include <functional>

using Registration = RegisterRuntimeInitializeAndCleanup;

Registration::RegisterRuntimeInitializeAndCleanup(CallbackFunction initCallback, CallbackFunction cleanupCallback,
                                                  SInt32 sortOrder, void* callbackData)
    : order(sortOrder),
      userData(callbackData),
      init(initCallback),
      cleanup(cleanupCallback),
      initialized(false),
      older(s_LastRegistered),
      newer(nullptr) {
    if (older != nullptr) older->newer = this;
    s_LastRegistered = this;
}

Registration::~RegisterRuntimeInitializeAndCleanup() {
    if (older != nullptr) older->newer = newer;
    if (newer != nullptr)
        newer->older = older;
    else
        s_LastRegistered = older;
}

bool Registration::Sort(const Registration* a, const Registration* b) {
    if (a->order != b->order) return a->order < b->order;
    return std::less<const Registration*>()(a, b); // < itself is not defined between unrelated objects
}

// In the order of start-up.
dynamic_array<Registration*> Registration::Collect(MemLabelId label) {
    dynamic_array<Registration*> registrations(label);
    for (Registration* each = s_LastRegistered; each != nullptr; each = each->older)
        registrations.push_back(each);
    std::sort(registrations.begin(), registrations.end(), Sort);
    return registrations;
}

void Registration::ExecuteInitializations() {
    for (Registration* each : Collect(kMemLabelGeneral)) {
        if (each->init != nullptr && !each->initialized) each->init(each->userData);
        each->initialized = true;
    }
}

void Registration::ExecuteCleanup() {
    const dynamic_array<Registration*> registrations = Collect(kMemLabelTemporary);
    for (size_t index = registrations.size(); index-- > 0;) {
        Registration* each = registrations[index];
        if (each->cleanup != nullptr && each->initialized) each->cleanup(each->userData);
        each->initialized = false;
    }
}
