// Reading and writing JSON documents by path, and requests and replies as lines. The files are in
// memory, because a disk would hide everything else.
#include <unistd.h>

#include <fstream>
#include <sstream>

#include <orvadrcore/file.h>
#include <orvadrcore/request.h>
#include <orvadrcore/response.h>

#include "support/bench.h"
#include "support/by_hand.h"

#if BENCH_HAS_BOOST
#include <boost/property_tree/json_parser.hpp>
#include <boost/property_tree/ptree.hpp>
#endif

namespace Bench {

namespace {

struct JsonFile {
    explicit JsonFile(std::size_t bytes) : document(MakeDocument(bytes))
    {
        WriteFile(path, ToLine(document) + "\n");
    }

    TempDir dir{Place::Memory};
    std::string path = dir.File("document.json");
    Json::Value document;
};

struct ReadJson : JsonFile {
    using JsonFile::JsonFile;
    std::string Result() const { return Flatten(read); }

    Json::Value read;
};

struct OurRead : ReadJson {
    using ReadJson::ReadJson;
    void Run() { Require(OrvaDRCore::File::Read(path, read), "cannot read"); }
};

// jsoncpp at its fastest: creates the reader once and ignores comments.
struct BareRead : ReadJson {
    explicit BareRead(std::size_t bytes) : ReadJson(bytes)
    {
        Json::CharReaderBuilder builder;
        builder["collectComments"] = false;
        reader.reset(builder.newCharReader());
    }
    void Run()
    {
        const std::string text = ReadFile(path);
        Require(reader->parse(text.data(), text.data() + text.size(), &read, nullptr), "no JSON");
    }

    std::unique_ptr<Json::CharReader> reader;
};

// A missing file is not an error. Joins the lines. Refuses comments, trailing commas, a second
// document and zero bytes. A failure leaves the caller's document unchanged.
struct ContractRead : ReadJson {
    explicit ContractRead(std::size_t bytes) : ReadJson(bytes)
    {
        Json::CharReaderBuilder builder;
        builder["allowComments"] = false;
        builder["allowTrailingCommas"] = false;
        builder["failIfExtra"] = true;
        reader.reset(builder.newCharReader());
    }
    void Run()
    {
        if (::access(path.c_str(), F_OK) != 0) return;
        std::string text = ReadFile(path);
        text.erase(std::remove(text.begin(), text.end(), '\n'), text.end());
        Require(text.find('\0') == std::string::npos, "a zero byte");
        Json::Value parsed;
        Require(reader->parse(text.data(), text.data() + text.size(), &parsed, nullptr), "no JSON");
        read.swap(parsed);
    }

    std::unique_ptr<Json::CharReader> reader;
};

struct StreamRead : ReadJson {
    using ReadJson::ReadJson;
    void Run()
    {
        std::ifstream file(path);
        file >> read;
    }
};

struct WriteJson : JsonFile {
    using JsonFile::JsonFile;
    std::string Result() const { return Flatten(Parse(ReadFile(path))); }
};

struct OurWrite : WriteJson {
    using WriteJson::WriteJson;
    void Run() { Require(OrvaDRCore::File::Write(path, document), "cannot write"); }
};

// Creates the writer once.
struct BareWrite : WriteJson {
    explicit BareWrite(std::size_t bytes) : WriteJson(bytes)
    {
        Json::StreamWriterBuilder builder;
        builder["commentStyle"] = "None";
        builder["emitUTF8"] = true;
        builder["indentation"] = "";
        writer.reset(builder.newStreamWriter());
    }
    void Run()
    {
        std::ostringstream text;
        writer->write(document, &text);
        text << '\n';
        WriteFile(path, text.str());
    }

    std::unique_ptr<Json::StreamWriter> writer;
};

struct StreamWrite : WriteJson {
    using WriteJson::WriteJson;
    void Run()
    {
        std::ofstream file(path);
        file << document;
    }
};

#if BENCH_HAS_BOOST
using Tree = boost::property_tree::ptree;

void AppendLeaves(std::string& text, const std::string& path, const Tree& tree)
{
    if (tree.empty()) text += path + "=" + tree.data() + "\n";
    for (const auto& [name, child] : tree) {
        std::string below = path;
        below += '.';
        below += name;
        AppendLeaves(text, below, child);
    }
}

struct BoostRead : JsonFile {
    using JsonFile::JsonFile;
    void Run() { boost::property_tree::read_json(path, tree); }
    std::string Result() const
    {
        std::string text;
        AppendLeaves(text, "", tree);
        return text;
    }

    Tree tree;
};

// It stores numbers and booleans as texts.
struct BoostWrite : WriteJson {
    explicit BoostWrite(std::size_t bytes) : WriteJson(bytes)
    {
        boost::property_tree::read_json(path, tree);
    }
    void Run() { boost::property_tree::write_json(path, tree, {}, false); }

    Tree tree;
};
#endif

// A handler's work from the line of a request to that of its reply: it returns the parameters.
struct LineToLine {
    std::string Result() const { return reply; }

    std::string line =
        R"({"api":"DR.Node","method":"get","version":1,"name":"backup-01","port":5001})";
    std::string reply;
};

struct OurLines : LineToLine {
    void Run()
    {
        OrvaDRCore::Request request;
        const bool isRead = OrvaDRCore::Request::FromText(line, request) && request.isValid();
        Require(isRead, "no request");
        reply = Response(Response::Success(request.getParams())).toLine();
    }

    using Response = OrvaDRCore::Response;
};

// jsoncpp with a reader and a writer that are made once.
struct BareLines : LineToLine {
    BareLines()
    {
        Json::StreamWriterBuilder builder;
        builder["emitUTF8"] = true;
        builder["indentation"] = "";
        writer.reset(builder.newStreamWriter());
    }
    void Run()
    {
        Json::Value params;
        Require(reader->parse(line.data(), line.data() + line.size(), &params, nullptr), "no JSON");
        Require(params["api"] == "DR.Node" && params["method"] == "get" && params["version"] == 1,
                "no request");
        for (const char* key : {"api", "method", "version"}) params.removeMember(key);
        Json::Value answer;
        answer["success"] = true;
        answer["data"].swap(params);
        std::ostringstream text;
        writer->write(answer, &text);
        reply = text.str();
    }

    std::unique_ptr<Json::CharReader> reader{Json::CharReaderBuilder().newCharReader()};
    std::unique_ptr<Json::StreamWriter> writer;
};

void AddSize(const std::string& size, std::size_t bytes)
{
    constexpr double OfJsoncpp = 1.05;
    Add<OurRead>("JSON read, " + size, Ours, bytes);
    Add<BareRead>("JSON read, " + size, Bare, bytes);
    Add<ContractRead>("JSON read, " + size, Contract, bytes);
    Add<StreamRead>("JSON read, " + size, "jsoncpp stream", bytes);
#if BENCH_HAS_BOOST
    Add<BoostRead>("JSON read, " + size, "Boost ptree", bytes);
#endif
    Aim({Bare}, OfJsoncpp);
    Add<OurWrite>("JSON write, " + size, Ours, bytes);
    Add<BareWrite>("JSON write, " + size, Bare, bytes);
    Add<StreamWrite>("JSON write, " + size, "jsoncpp stream", bytes);
#if BENCH_HAS_BOOST
    Add<BoostWrite>("JSON write, " + size, "Boost ptree", bytes);
#endif
    Aim({Bare}, OfJsoncpp);
}

}  // namespace

void AddJson()
{
    AddSize("1 KB", 1000);
    AddSize("100 KB", 100'000);
    AddSize("5 MB", 5'000'000);
    Add<OurLines>("request line to reply line", Ours);
    Add<BareLines>("request line to reply line", Bare);
}

}  // namespace Bench
