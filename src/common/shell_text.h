#pragma once

// The one place that knows what may stand in a command and how it is written there. Ordinary values pass
// unchanged; a value that would make the shell, rsync or ssh do something else is quoted where that is
// possible, and refused where it is not. A refusal is traced with the name of the field.

#include "common/refusal.h"

#include <string>
#include <string_view>

namespace bakjob
{

// Whether a text can be a job's name: 1 to 127 bytes, no file-name step ("/", ".", ".."), no control
// character and nothing that escape_path would leave to the shell.
bool is_job_name(std::string_view name);

// A path as part of a word of a command: escaped once. Refused when it holds a character that the escaping
// leaves to the shell, or does not fit PATH_SIZE when escaped. `field` names it in the trace.
Checked shell_path_part(const char *field, std::string_view path);

// A path as a whole word: also refused when it begins with "-", as an option does, or with "~", which the
// shell replaces there.
Checked shell_path(const char *field, std::string_view path);

// Of a path that holds something that any shell acts on where it stands, blanks included: for commands that
// the shell of the remote host reads once more, after the escapes are gone. "C#" and "a~b" pass, "#C" and
// "~a" do not.
Refusal refusal_for_shells(const char *field, std::string_view path);

// A job name as part of a word that is no path. Only for names that is_job_name accepts, or the empty one.
std::string shell_word(std::string_view job_name);

// A grep pattern, as part of a word, that matches the job name and nothing else.
std::string grep_word(std::string_view job_name);

// Of a host or user name that may not stand in a command as it is: an empty host, a blank, a control
// character, something that the shell acts on, a leading "-", or what would end the name for rsync or ssh.
Refusal refusal_of_host(std::string_view remote_ip);
Refusal refusal_of_rsync_user(std::string_view user);
Refusal refusal_of_ssh_user(std::string_view user);

// Of a port text that may not: something that the shell acts on, blanks but at its end.
Refusal refusal_of_port(std::string_view port);

// Of a password that is no base64 text, the only kind that goes into a command.
Refusal refusal_of_base64(const char *field, std::string_view password);

// Contexts that read a text once more. Each is an explicit further step around an already escaped text.
std::string in_double_quotes(std::string_view text); // with the quotes
std::string in_single_quotes(std::string_view text); // with the quotes
std::string in_backquotes(std::string_view text);    // without them

} // namespace bakjob
