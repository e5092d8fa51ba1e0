#pragma once

// For threads that drop descriptors which strangers sent: the last reference to a lingering TCP
// socket makes its dropper wait, as long as the stranger likes. A wait of this kind ends with a
// signal, so the thread gets one every now and then, while it is at work.
//
// Where the kernel lets a socket refuse descriptors (6.16) it is only needed for sockets that may
// take some: those of plug-ins, when they are dropped unread. Functions for any thread; the signal
// is its own, and the handler does nothing that others notice but EINTR.
namespace platform::ipc {

// Whether a socket cannot be told to take no descriptors.
[[nodiscard]] bool isWaitBreakerNeeded();

// From here on the calling thread waits no longer than some hundredths of a second for a socket
// that it drops; ends by itself when this was not called for a while.
void breakWaits();

} // namespace platform::ipc
