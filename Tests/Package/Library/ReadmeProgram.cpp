// The program that the README shows.
#include <zarvo.hpp>

#include <iostream>

int main() {
#include <ReadmeProgram.inc>
    return 0;
}
