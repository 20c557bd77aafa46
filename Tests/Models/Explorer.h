// Tries every interleaving of a few threads' atomic steps over a small state, and finds the shortest that goes wrong.
//
//   struct Model : Explorable<Shared, Thread, 3> {   // values with <=>; a Thread has a pc, where it stands
//       bool Step(size_t self, int choice);          // one atomic step; false: the thread can't go that way now
//       const char* Fault() const;                   // null, or what is wrong now
//       const char* FaultAtEnd() const;              // the same, when no thread can move
//   };
//   EXPECT_EQ("", Explore(Model{}));
//   EXPECT_NE("", Explore(Model{}, pc));             // broken: the step made at pc leaves what is shared as it was
//
// A step that may go two ways is offered choice 0 and 1; any other refuses 1. Steps are sequentially consistent: memory
// orders are the thread sanitizer's matter.
#pragma once

#include <array>
#include <queue>
#include <set>
#include <string>

template <typename SharedPart, typename ThreadPart, size_t count>
struct Explorable {
    SharedPart shared;
    std::array<ThreadPart, count> threads;
    auto operator<=>(const Explorable&) const = default;
};

// Empty when no interleaving goes wrong; else the fault, and whose steps lead to it.
template <typename Model>
std::string Explore(const Model& initial, int brokenPc = -1) {
    std::set<Model> seen{initial};
    std::queue<std::pair<Model, std::string>> open({{initial, " after steps of "}});
    for (; !open.empty(); open.pop()) {
        const auto& [state, schedule] = open.front();
        bool canMove = false;
        for (size_t way = 0; way < 2 * state.threads.size(); ++way) {
            Model next = state;
            if (!next.Step(way / 2, static_cast<int>(way % 2))) continue;
            if (state.threads[way / 2].pc == brokenPc) next.shared = state.shared;
            if (next == state) continue; // for ever
            canMove = true;
            const std::string longer = schedule + static_cast<char>('0' + way / 2);
            if (const char* fault = next.Fault()) return fault + longer;
            if (seen.insert(next).second) open.emplace(next, longer);
        }
        if (canMove) continue;
        if (const char* fault = state.FaultAtEnd()) return fault + schedule;
    }
    return {};
}
