#pragma once

// Why a value may not be used, and values that may have been refused.

#include <string>
#include <string_view>
#include <utility>

namespace bakjob
{

// In words, as "port refused: too long"; empty when nothing is refused. Never holds a secret.
struct Refusal {
    std::string why;

    explicit operator bool() const { return !why.empty(); }
};

// Make a refusal and trace it as an error; `refused` words it as "FIELD refused: WHY".
Refusal trace_refusal(std::string why);
Refusal refused(std::string_view field, std::string_view why);

// A text, or why there is none.
class Checked
{
public:
    Checked(std::string text) : text_(std::move(text)) {}
    Checked(Refusal refusal) : refusal_(std::move(refusal)) {}

    explicit operator bool() const { return !refusal_; }
    const std::string &operator*() const { return text_; }
    const std::string *operator->() const { return &text_; }
    [[nodiscard]] const Refusal &refusal() const { return refusal_; }
    [[nodiscard]] std::string value_or(const std::string &other) const { return *this ? text_ : other; }

    friend bool operator==(const Checked &checked, std::string_view text)
    {
        return checked && checked.text_ == text;
    }

private:
    std::string text_;
    Refusal refusal_;
};

} // namespace bakjob
