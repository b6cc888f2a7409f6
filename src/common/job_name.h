#pragma once

// A job's name that may stand in commands and in names of files. It is checked once, where it comes in;
// whoever composes either asks for one by its signature.

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace bakjob
{

inline constexpr std::size_t JOB_NAME_SIZE = 128; // bytes of a name, terminator included

class JobName
{
public:
    // Nullopt for a text that is_job_name (shell_text.h) refuses.
    static std::optional<JobName> checked(std::string_view text);

    [[nodiscard]] const std::string &text() const { return text_; }
    [[nodiscard]] const char *c_str() const { return text_.c_str(); }

private:
    explicit JobName(std::string_view text) : text_(text) {}

    std::string text_;
};

} // namespace bakjob
