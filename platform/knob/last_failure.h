// SPDX-License-Identifier: Apache-2.0
// Why the last call of this thread failed, so that the text of its status can say it.
#pragma once

#include <cstdint>
#include <string_view>

namespace Knob {

// Keeps the reason for the calling thread: one line, control characters escaped, cut to a bounded
// length. Every failing call does this, so that a failure is never explained by the reason of an
// earlier one with the same status. A call that succeeds keeps the reason: a program may undo its
// work before it asks for the text. Without memory the reason is lost.
void rememberFailure(uint32_t status, std::string_view reason) noexcept;

// For a failure that has no status of this library.
void forgetFailure() noexcept;

// The text of a status, or "NAME: REASON" for the status of the thread's last failed call.
// Valid until the calling thread asks for another text or makes another call that fails.
const char *explainedStatusText(uint32_t status) noexcept;

}  // namespace Knob
