// Random scenario steps for vce-sim --chaos: every line is a step of the
// scenario format (docs/scenario-format.md), so a run that goes wrong can be
// written out, shrunk and replayed as it is. The vocabulary is the actors'
// whole one, valid and invalid, weighted toward what tends to break an
// engine: streams that start, change and end while the client comes and
// goes, callbacks that call back, ends of calls and dead clients.
#ifndef QUELLBORN_TOOLS_VCESIM_CHAOSGENERATOR_H
#define QUELLBORN_TOOLS_VCESIM_CHAOSGENERATOR_H

#include <cstdint>
#include <random>
#include <string>

class ChaosGenerator {
public:
    enum class Actor { kAny, kClient, kModem, kMedia, kLink };

    explicit ChaosGenerator(uint64_t seed) : mRandom(seed) {}

    // One step line for `actor` (kAny picks one by weight).
    std::string next(Actor actor = Actor::kAny);

private:
    std::string client();
    std::string modem();
    std::string media();
    std::string link();
    std::string streamFields();

    int pick(int count) { return std::uniform_int_distribution<int>(0, count - 1)(mRandom); }
    template <typename T, size_t N>
    const T& oneOf(const T (&items)[N]) { return items[pick(static_cast<int>(N))]; }
    bool chance(int percent) { return pick(100) < percent; }

    std::mt19937_64 mRandom;
};

#endif  // QUELLBORN_TOOLS_VCESIM_CHAOSGENERATOR_H
