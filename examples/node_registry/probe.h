// Looks at a node from this machine.
#ifndef NODE_REGISTRY_PROBE_H
#define NODE_REGISTRY_PROBE_H

#include <string>

#include <json/value.h>

namespace NodeRegistry {

// How long to wait until a node accepts a connection.
constexpr int ProbeTimeoutMSec = 300;

// "reachable" if a TCP connection is accepted in time, otherwise "unreachable". Null for any host
// name but "localhost", because a DNS lookup may take far longer than a probe.
Json::Value ProbeAddress(const std::string& address, int port);

// {"used":bytes,"free":bytes} of the file system that contains the path; null if it does not exist.
Json::Value MeasureVolume(const std::string& path);

}  // namespace NodeRegistry

#endif
