// The example node_registry as tests call it: requests made of texts, replies compared as texts.
#ifndef ORVADRCORE_TESTS_NODE_REGISTRY_H
#define ORVADRCORE_TESTS_NODE_REGISTRY_H

#include <gtest/gtest.h>
#include <sys/prctl.h>
#include <sys/types.h>
#include <sys/wait.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <system_error>
#include <vector>

#include <orvadrcore/file_lock.h>
#include <orvadrcore/response.h>

#include "await.h"
#include "program.h"
#include "temp_dir.h"

inline std::string ReadFile(const std::string& path)
{
    std::ostringstream text;
    text << std::ifstream(path, std::ios::binary).rdbuf();
    return text.str();
}

inline void WriteFile(const std::string& path, const std::string& text)
{
    std::ofstream(path, std::ios::binary) << text;
}

// A member of a JSON object whose value is a text.
inline std::string Text(const std::string& name, const std::string& text)
{
    return '"' + name + "\":\"" + text + '"';
}

// A request; `params` are members of a JSON object, such as "name":"a".
inline std::string Call(const std::string& method, const std::string& params = "")
{
    return R"({"api":"DR.Node","version":1,"method":")" + method + '"' +
           (params.empty() ? "" : "," + params) + "}";
}

inline std::string CreateCall(const std::string& name)
{
    return Call("create", R"("name":")" + name +
                              R"(","address":"a.example","port":5001,"volume":"/volume1/r")");
}

// A node as replies show it; what is not given is as CreateCall has it.
inline std::string NodeText(const std::string& id, const std::string& name,
                            const std::string& address = "a.example", int port = 5001,
                            const std::string& volume = "/volume1/r", bool enabled = true)
{
    return "{" + Text("address", address) + R"(,"enabled":)" + (enabled ? "true" : "false") + "," +
           Text("id", id) + "," + Text("name", name) + R"(,"port":)" + std::to_string(port) + "," +
           Text("volume", volume) + "}";
}

inline std::string SuccessText(const std::string& data)
{
    return R"({"data":)" + data + R"(,"success":true})";
}

inline std::string IdText(const std::string& id)
{
    return SuccessText(R"({"id":")" + id + R"("})");
}

inline std::string FailureText(int code, const std::string& name, const std::string& reason)
{
    return R"({"error":{"code":)" + std::to_string(code) + R"(,"errors":{"name":")" + name +
           R"(","reason":")" + reason + R"("}},"success":false})";
}

inline std::vector<std::string> Lines(const std::string& text)
{
    std::vector<std::string> lines;
    std::size_t begin = 0;
    for (std::size_t end = text.find('\n'); end != std::string::npos;
         end = text.find('\n', begin)) {
        lines.push_back(text.substr(begin, end - begin));
        begin = end + 1;
    }
    if (begin < text.size()) lines.push_back(text.substr(begin));
    return lines;
}

class NodeRegistryTest : public ::testing::Test {
  protected:
    // Refreshes that outlive their handler become children of the test.
    NodeRegistryTest() : database(dir.File("nodes.db")) { ::prctl(PR_SET_CHILD_SUBREAPER, 1); }

    // Waits for all processes that were started, and removes the locks of the test.
    void TearDown() override
    {
        EXPECT_TRUE(AwaitUntil([] {
            pid_t pid = 0;
            do {
                pid = ::waitpid(-1, nullptr, WNOHANG);
            } while (pid > 0);
            return pid < 0 && errno == ECHILD;
        })) << "a process does not end";
        std::error_code ignored;
        std::filesystem::remove_all(OrvaDRCore::FileLock::getLockFilePath(dir.Path()), ignored);
    }

    ProgramResult Run(const std::vector<std::string>& options, const std::string& input = "") const
    {
        std::vector<std::string> words = {NODE_REGISTRY_PROGRAM, "--db", database};
        words.insert(words.end(), options.begin(), options.end());
        return RunProgram(words, input);
    }

    // A shell command in which $0 is the program and $1 the database.
    ProgramResult RunInShell(const std::string& command, const std::string& input = "") const
    {
        return RunProgram({"/bin/sh", "-c", command, NODE_REGISTRY_PROGRAM, database}, input);
    }

    // The one reply to one line.
    std::string Ask(const std::string& line) const
    {
        const ProgramResult result = Run({}, line + "\n");
        EXPECT_EQ(result.code, 0);
        EXPECT_EQ(result.err, "");
        const std::vector<std::string> replies = Lines(result.out);
        EXPECT_EQ(replies.size(), 1U);
        return replies.empty() ? "" : replies[0];
    }

    // Creates a node and answers its id.
    std::string Create(const std::string& name) const
    {
        return OrvaDRCore::Response(Ask(CreateCall(name))).getDataFieldtoStr("id");
    }

    // The names of the nodes that a list request with these parameters answers.
    std::vector<std::string> List(const std::string& params = "") const
    {
        const OrvaDRCore::Response response(Ask(Call("list", params)));
        EXPECT_TRUE(response.hasDataField("nodes")) << params;
        std::vector<std::string> names;
        for (const Json::Value& node : response.getDataField("nodes")) {
            names.push_back(node["name"].asString());
        }
        return names;
    }

    TempDir dir;
    std::string database;
};

#endif
