#pragma once

#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/types.h>
#include <unistd.h>

// recvmsg(2) and sendmsg(2) as the loop makes them. The C library's own are made to be cancelled,
// at a price that each request pays twice; only sanitizers need them, which see through them who
// waits for whom, and what memory the kernel touches. Any thread; no state.
namespace platform::ipc {

#if defined(__SANITIZE_THREAD__) || defined(__SANITIZE_ADDRESS__)

inline ssize_t receiveMessage(int socket, msghdr& message, int flags) {
    return ::recvmsg(socket, &message, flags);
}

inline ssize_t sendMessage(int socket, const msghdr& message, int flags) {
    return ::sendmsg(socket, &message, flags);
}

#else

inline ssize_t receiveMessage(int socket, msghdr& message, int flags) {
    return ::syscall(SYS_recvmsg, socket, &message, flags);
}

inline ssize_t sendMessage(int socket, const msghdr& message, int flags) {
    return ::syscall(SYS_sendmsg, socket, &message, flags);
}

#endif

} // namespace platform::ipc
