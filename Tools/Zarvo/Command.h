// zarvo as a function of its arguments and descriptors, so that it runs without a process of its own.
//
//   World world;
//   world.arguments = {"list", "game.zarvo"};
//   world.output = descriptor;
//   const Ending ending = RunZarvo(world);
//
// SIGPIPE has to be ignored. Any thread; the descriptors stay the caller's.
#pragma once

#include <atomic>
#include <string>
#include <vector>

struct World {
    std::vector<std::string> arguments; // without the program's name
    int input = -1;
    int output = -1;
    int error = -1;
    bool isOutputTerminal = false;
    bool isErrorTerminal = false;
    const std::atomic<int>* signal = nullptr; // gets the number of a signal that asks the run to end
};

struct Ending {
    int status;     // 0: all was done. 1: something was wrong. 2: wrong usage, or no archive could be opened
    int signal = 0; // that has ended the run, and is to end the process: World::signal's, or SIGPIPE
};

Ending RunZarvo(const World& world);
