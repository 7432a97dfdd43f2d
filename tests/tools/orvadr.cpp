#include "orvadr.h"

#include <gtest/gtest.h>

#include "base/json_helpers.h"
#include "schema.h"

Words CommandLine(const Words& words)
{
    Words line{ORVADR_PROGRAM};
    line.insert(line.end(), words.begin(), words.end());
    return line;
}

ProgramResult RunOrvadr(const Words& words)
{
    return RunProgram(CommandLine(words));
}

const Json::Value& Answer::Only() const
{
    EXPECT_EQ(objects.size(), 1U);
    return objects.isArray() && objects.size() == 1 ? objects[0] : Json::Value::nullSingleton();
}

Answer Ask(Words words)
{
    const std::string command = words[0];
    words.insert(words.begin() + 1, "--json");
    ProgramResult result = RunOrvadr(words);
    Answer answer{result.code, {}, result.err};
    if (!result.out.empty() && result.out.back() == '\n') result.out.pop_back();
    EXPECT_TRUE(OrvaDRCore::fromString(answer.objects, result.out)) << result.out << result.err;
    const Json::Value& schema = OrvadrSchema();
    EXPECT_EQ(FindMismatch(answer.objects, schema["$defs"][command], schema), "");
    EXPECT_EQ(FindMismatch(answer.objects, schema, schema), "");
    return answer;
}
