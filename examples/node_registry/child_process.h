// What a refresh in the background does first: it runs in a forked child of the handler's process.
#ifndef NODE_REGISTRY_CHILD_PROCESS_H
#define NODE_REGISTRY_CHILD_PROCESS_H

namespace NodeRegistry {

// Gives up what a child inherits from a server and must not keep:
// - TCP sockets. A client whose server was killed would wait for the child, and a new server could
//   not have the port.
// - Blocked signals. A server that waits for SIGTERM blocks it; its child must end by it.
//
// Takes no lock of the C library but malloc's, which is usable after a fork.
void LeaveServer();

}  // namespace NodeRegistry

#endif
