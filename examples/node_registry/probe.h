// What can be found out about a node from here.
#ifndef NODE_REGISTRY_PROBE_H
#define NODE_REGISTRY_PROBE_H

#include <string>

#include <json/value.h>

namespace NodeRegistry {

// How long a node has to accept a connection.
constexpr int ProbeTimeoutMSec = 300;

// "reachable" when a TCP connection is accepted in time, otherwise "unreachable". Null for a host
// name other than "localhost": looking it up may take far longer than any probe.
Json::Value ProbeAddress(const std::string& address, int port);

// {"used":bytes,"free":bytes} of the file system that a path lies on; null when it is not there.
Json::Value MeasureVolume(const std::string& path);

}  // namespace NodeRegistry

#endif
