// Parts of a test that run in processes of their own: the product's state lives as long as its
// process, and a device that restarts begins without it.
#pragma once

#include <functional>

namespace test {

/// Does `work`, with its checks, in a process forked from this one, which must have no other
/// threads. Checks that fail show themselves there.
/// @return whether it has come to its end and all checks have held.
bool InOwnProcess(const std::function<void()>& work);

}  // namespace test
