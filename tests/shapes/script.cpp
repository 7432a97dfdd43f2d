#include "script.h"

#include <array>

#include "operations.h"

namespace Shapes {

namespace {

// How many times less often odd things come.
constexpr std::array<std::size_t, 4> Tameness = {1, 3, 30, 30};

// Mostly all of them, because that is what callers have.
OrvaDRCore::Shortcuts AnyShortcuts(Random& random)
{
    switch (random.Below(8)) {
        case 0: return {true, false, false};
        case 1: return {false, true, false};
        case 2: return {false, false, true};
        case 3: return {true, true, false};
        default: return {true, true, true};
    }
}

}  // namespace

Script MakeScript(std::uint64_t seed)
{
    Random random(seed);
    Script script{seed, AnySchema(random), {}, AnyShortcuts(random), {}};
    for (unsigned int& limit : script.limits) limit = static_cast<unsigned int>(random.Below(3));
    Pool pool{script.schema, random.Of(Tameness), {}};
    pool.shapes.resize(2 + random.Below(14));
    for (std::uint64_t& shape : pool.shapes) shape = random.Next();
    const std::size_t count = 30 + random.Below(300);
    while (script.operations.size() < count)
        script.operations.push_back(AnyOperation(random, pool));
    return script;
}

std::string Describe(const Script& script)
{
    std::string text = "schema: " + script.schema.name + ", retry limits:";
    for (const unsigned int limit : script.limits) text += " " + std::to_string(limit);
    text += ", shortcuts:";
    if (script.shortcuts.shapes) text += " shapes";
    if (script.shortcuts.inserts) text += " inserts";
    if (script.shortcuts.lookups) text += " lookups";
    return text;
}

}  // namespace Shapes
