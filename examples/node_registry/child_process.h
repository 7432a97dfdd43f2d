// The first step of a background refresh, which runs in a forked child of the handler's process.
#ifndef NODE_REGISTRY_CHILD_PROCESS_H
#define NODE_REGISTRY_CHILD_PROCESS_H

namespace NodeRegistry {

// Drops what a child inherits from a server but must not keep:
// - TCP sockets. If the server is killed, its clients would wait for the child, and a new server could
//   not bind the port.
// - Blocked signals. A server blocks SIGTERM to wait for it, but the child must die of it.
//
// Takes no lock of the C library except malloc's, which glibc keeps usable after a fork.
void LeaveServer();

}  // namespace NodeRegistry

#endif
