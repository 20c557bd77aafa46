// The C++ program that docs/embedding.md shows.
#include <zarvo.hpp>

#include <iostream>

int main() {
#include <Shown.cpp.inc>
    return 0;
}
