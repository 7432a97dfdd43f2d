#include "options.h"

namespace NodeRegistry {

const char* const UsageText =
    "usage: node_registry [--db FILE] [--verbose] [--pretty] [--help] [INPUT]\n";

const char* const HelpText =
    R"(
Answers requests about the remote nodes of a storage appliance. Reads one JSON
object a line from the file INPUT, or from standard input when it is missing or
"-", and writes one JSON reply a line. The nodes are kept in an SQLite file,
which several of these programs may use at the same time.

Options:
  --db FILE   the file of the nodes, made when it is missing
              (default ./node_registry.db)
  --verbose   log lines also on standard error; they always go to syslog
  --pretty    for people: each request before its reply, errors by their name
  --help      this text

A request names the API, its version and the method, beside the parameters:
  {"api":"DR.Node","version":1,"method":"get","name":"backup-01"}

Methods:
  create  name, address, port, volume, [enabled]     data: {"id":ID}
          Adds a node. No two nodes have the same name; upper and lower case
          differ. A node is enabled unless said otherwise.
  get     id or name                                 data: the node
          {"id":ID,"name":...,"address":...,"port":...,
           "volume":...,"enabled":...}
  set     id or name, and at least one of            data: {"id":ID}
          name, address, port, volume, enabled
          Changes a node. With an id, a name is the new name; without one, the
          name says which node is meant.
  delete  id or name                                 data: {"id":ID}
          Removes a node.
  list    [filter]                                   data: {"nodes":[node,...]}
          The nodes that pass the filter, or all, sorted by the bytes of their
          names. A filter is an object with one of these members; at most 32
          filters, inner ones counted:
            {"ids":[ID,...]}          those with one of the ids
            {"not_ids":[ID,...]}      those with none of the ids
            {"enabled":BOOL}          those that are, or are not, enabled
            {"not_enabled":BOOL}      the others
            {"and":[filter,...]}      those that pass every filter
            {"or":[filter,...]}       those that pass any filter

Parameters:
  id       text of 1 to 64 bytes (nodes get a UUID)
  name     text of 1 to 64 bytes
  address  text of 1 to 253 bytes, without blanks
  port     integer from 1 to 65535
  volume   path that begins with /volume, of at most 4096 bytes
  enabled  true or false
Texts are UTF-8 without control characters. Other parameters are refused.

Replies:
  {"success":true,"data":{...}}
  {"success":false,"error":{"code":CODE,"errors":{"name":NAME,"reason":REASON}}}
  401 BAD_PARAMETER           no request, or a parameter is missing or wrong
  404 ERR_DATABASE_OPERATION  the database failed; "errors" tells each try
  507 ERR_NODE_NOT_EXIST      no node has this id or name
  508 ERR_NODE_EXIST          another node has this name
  510 ERR_NODE_CREATE         no id could be made
  513 ERR_NODE_GET            the stored node is damaged
  515 ERR_NODE_LIST           a stored node is damaged
  526 ERR_NO_SUCH_API         unknown API, version or method

Exit codes:
  0  every line was answered, well or badly
  1  INPUT could not be read or standard output not be written
  2  wrong options
)";

bool ReadOptions(int argc, const char* const* argv, Options& ret_options)
{
    Options options;
    bool hasInput = false;
    for (int index = 1; index < argc; ++index) {
        const std::string word = argv[index];
        if (word == "--db" && index + 1 < argc) {
            options.database = argv[++index];
        } else if (word == "--verbose") {
            options.isVerbose = true;
        } else if (word == "--pretty") {
            options.isPretty = true;
        } else if (word == "--help") {
            options.wantsHelp = true;
        } else if (!hasInput && (word == "-" || word.compare(0, 1, "-") != 0)) {
            options.input = word;
            hasInput = true;
        } else {
            return false;
        }
    }
    // For an empty name SQLite makes a file that is gone when the program ends.
    if (options.database.empty()) return false;
    ret_options = options;
    return true;
}

}  // namespace NodeRegistry
