// The stand-in's objects. Each holds its value and is owned by the autorelease pool that it was made in.
#pragma once

#include "PlatformDependent/OSX/Platform.h"

#include <string>
#include <vector>

class StandinObject {
public:
    virtual ~StandinObject() = default;
};

class NSString : public StandinObject {
public:
    explicit NSString(std::string value) : text(std::move(value)) {}
    const std::string text; // valid UTF-8, or a path as the system gave it
};

class NSURL : public StandinObject {
public:
    explicit NSURL(std::string value) : path(std::move(value)) {}
    const std::string path; // absolute, or empty
};

class NSArray : public StandinObject {
public:
    explicit NSArray(std::vector<NSString*> value) : objects(std::move(value)) {}
    const std::vector<NSString*> objects; // made in the same pool or an outer one
};

// Gives object, made with plain new, to the current pool. Null is allowed.
void AddToAutoreleasePool(StandinObject* object);

template <typename T, typename Value>
T* MakeAutoreleased(Value value) {
    T* object = new T(std::move(value));
    AddToAutoreleasePool(object);
    return object;
}

// See NSString_stringByResolvingSymlinksInPath.
std::string ResolveLinks(const std::string& path);
