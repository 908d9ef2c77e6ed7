// SPDX-License-Identifier: Apache-2.0
// Why the last call of this thread failed, so that the text of its status can say it.
#pragma once

#include <cstdint>
#include <string_view>

namespace Knob {

// Forgets the reason of an earlier call. Every call that can fail does this first, so that a later
// failure with the same status is never explained by an old reason.
void forgetFailure() noexcept;

// Keeps the reason for the calling thread: one line, control characters escaped, cut to a bounded
// length. Without memory the reason is lost and the status's own text is used.
void rememberFailure(uint32_t status, std::string_view reason) noexcept;

// The text of a status: "TEXT", or "TEXT: REASON" for the status of the thread's last failed call.
// Valid until the calling thread asks for another text or makes another call.
const char *explainedStatusText(uint32_t status) noexcept;

}  // namespace Knob
