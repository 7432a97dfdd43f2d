#include "api_help.h"

namespace NodeRegistry {

const char* const ApiHelp =
    R"(A request names the API, its version and the method, beside the parameters:
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
  status  (none)                     data: {"age":SECONDS,"time":SECONDS,
          "total":COUNT,"enabled":COUNT,"volumes":{VOLUME:SPACE,...},
          "probes":{NAME:PROBE,...}}
          How the nodes are, "age" seconds ago. SPACE is that of the volume on
          this machine, {"used":BYTES,"free":BYTES}, or null when it is not
          there. Each enabled node is probed: PROBE is "reachable" when it takes
          a TCP connection within 300 milliseconds, otherwise "unreachable", and
          null for a host name other than localhost: names are not looked up.
          The status is kept in FILE.status.cached, see --status-dir. The first
          request waits for it. Later ones get the last one at once; when it is
          old, one child process refreshes it meanwhile. For root only, as a
          rule.
  import  file, [volume]            data: {"created":COUNT,
                                           "refused":{NAME:REASON,...}}
          Creates the nodes that stand in a file, one "name = address:port" a
          line, an IPv6 address in brackets. Names are single words; lines
          without "=" are passed over; of two lines with one name the first
          counts. All get the same volume (default /volume1/replica).
  export  file                                       data: {"count":COUNT}
          Writes all nodes into a file, as one JSON document. The file is
          replaced as a whole.
  restore file                                       data: {"count":COUNT}
          Makes the nodes those of an exported file, with the ids that they have
          there: all of them, or none when one is bad. Of all exports and
          restores one works at a time. Both for root only, as a rule.

Parameters:
  id       text of 1 to 64 bytes (nodes get a UUID)
  name     text of 1 to 64 bytes
  address  text of 1 to 253 bytes, without blanks
  port     integer from 1 to 65535
  volume   path that begins with /volume, of at most 4096 bytes
  enabled  true or false
  file     path of at most 4095 bytes
Texts are UTF-8 without control characters. Other parameters are refused.

Replies:
  {"success":true,"data":{...}}
  {"success":false,"error":{"code":CODE,"errors":{"name":NAME,"reason":REASON}}}
  401 BAD_PARAMETER           no request, or a parameter is missing or wrong
  404 ERR_DATABASE_OPERATION  the database failed; "errors" tells each try
  507 ERR_NODE_NOT_EXIST      no node has this id or name
  508 ERR_NODE_EXIST          another node has this name
  510 ERR_NODE_CREATE         no id could be made
  513 ERR_NODE_GET            the stored node is damaged, or the status could not
                              be taken, or the export not be written or locked
  514 ERR_NODE_SET            the restore could not be locked
  515 ERR_NODE_LIST           a stored node is damaged
  525 ERR_NO_PERMISSION       the status needs a lock that this user cannot open
  526 ERR_NO_SUCH_API         unknown API, version or method
)";

}  // namespace NodeRegistry
