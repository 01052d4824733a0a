// Questions that may never get an answer.
#ifndef VORN_CTL_ANSWER_WITHIN_HPP
#define VORN_CTL_ANSWER_WITHIN_HPP

#include <chrono>
#include <functional>
#include <optional>
#include <string>

namespace ctl {

// What `ask` answers, asked in a process of its own: a dead network server can keep it for ever.
// Nothing when it gives no answer within `limit`.
std::optional<std::string> answer_within(std::chrono::milliseconds limit,
                                         const std::function<std::string()>& ask);

}  // namespace ctl

#endif
