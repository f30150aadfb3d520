#pragma once

#include <sys/types.h>

#include <cstddef>
#include <initializer_list>
#include <string_view>

namespace base {

/// The most descriptors that go with one message.
inline constexpr size_t kPassedMax = 2;

/// Sends `bytes` whole, and descriptors with them, without waiting for room. @return whether all of it was sent
bool SendWithDescriptors(int socket, std::string_view bytes, std::initializer_list<int> descriptors);

/// Waits for bytes, up to `size`, and the descriptors that come with them, close-on-exec; -1 where there are fewer than
/// `count`, and of more all are dropped. @return as read() does
ssize_t ReceiveWithDescriptors(int socket, void* to, size_t size, int* descriptors, size_t count);

}  // namespace base
