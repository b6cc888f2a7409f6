#include "remote/sizes.h"

#include "common/address.h"
#include "common/debug_log.h"
#include "common/excludes.h"
#include "common/folder_table.h"
#include "common/shell.h"
#include "common/shell_text.h"
#include "common/text.h"
#include "config/current_job.h"
#include "remote/ssh_login.h"

#include <optional>
#include <vector>

namespace bakjob
{

namespace
{

constexpr std::size_t LOCAL_COMMAND_SIZE = 4648;

bool is_du_size(std::string_view text)
{
    const bool begins_with_digit = !text.empty() && text.front() >= '0' && text.front() <= '9';
    return begins_with_digit && (text.size() == 1 || contains("kKMG", text.substr(text.size() - 1)));
}

// The first line that a remote command prints; of a refused one, the empty line. Nullopt when it could not be
// started.
std::optional<std::string> reply_of(const Checked &command)
{
    return command ? first_line(*command) : std::string();
}

// How du is called where logins have no name, by address kind, with du's own folder known to be there or not:
// what stands before the folder and behind it. The blanks differ.
std::string du_as_client(const RsyncJob &job, const std::string &folder)
{
    const auto question = ssh_command(job, SshLogin::AS_CLIENT, "ls /usr/bin/du 2>/dev/null");
    const bool present = question && rsync_remote_has_du(*question) == 1;
    const AddressKind kind = ip_address_kind(job.remote_ip);
    if (present) {
        const char *const blanks = kind == ADDRESS_IPV6 ? "  " : " ";
        return format_text("/usr/bin/du -sh %s%s%s 2>&1", exclude_options(ExcludeForm::DU_REMOTE).c_str(),
                           blanks, folder.c_str());
    }
    const bool link_local = kind == ADDRESS_LINK_LOCAL;
    return format_text("du -sh %s%s%s 2>&1", link_local ? " " : "", folder.c_str(), link_local ? "" : " ");
}

Checked du_command(const RsyncJob &job, const std::string &folder)
{
    const auto login = ssh_login_of(job);
    if (!login) return NO_SSH_LOGIN;
    return ssh_command(job, *login,
                       *login == SshLogin::AS_CLIENT ? du_as_client(job, folder)
                                                     : "du -sh " + folder + " 2>&1");
}

// Nullopt when a folder cannot be asked for: a total without it would be wrong.
std::optional<std::string> local_du_command(char *folders)
{
    FolderTable table{};
    rsync_split_list(folders, ":", table);
    std::string command = format_text("/usr/bin/du -shc %s ", exclude_options(ExcludeForm::DU_HERE).c_str());
    for (int i = 0; i < table.count; ++i) {
        const auto folder = shell_path("local_path", table.entries[i]);
        if (!folder) return std::nullopt;
        command += *folder + ' ';
    }
    command += " 2>/dev/null";
    if (table.left_out > 0 || command.size() >= LOCAL_COMMAND_SIZE) return std::nullopt;
    return command;
}

} // namespace

void size_of_df_line(std::string_view line, SizeText &size)
{
    for (int skipped = 0; skipped < 3; ++skipped) {
        next_word(line);
    }
    const std::string_view word = next_word(line);
    if (word.empty() || !copy_text(size, word)) copy_text(size, UNKNOWN_SIZE);
}

void size_of_du_reply(std::string_view line, SizeText &size)
{
    const std::string_view word = next_word(line);
    if (!word.empty() && !copy_text(size, word)) copy_text(size, UNKNOWN_SIZE);
    if (!is_du_size(size)) copy_text(size, UNKNOWN_SIZE);
}

void rsync_local_free_space(const std::string &volume, SizeText &free)
{
    copy_text(free, UNKNOWN_SIZE);
    const auto word = shell_path("volume", volume);
    if (!word) return;
    const auto line = first_line(format_text("df -h | grep %s 2>&1", word->c_str()));
    if (line) size_of_df_line(*line, free);
}

void measure_remote_free_space(const RsyncJob &job, SizeText (&free)[VOLUMES])
{
    if (job.remote_ip[0] == '\0') return;
    const auto login = ssh_login_of(job);
    std::vector<Checked> commands;
    for (int i = 0; i < VOLUMES; ++i) {
        const std::string remote = format_text("df -h | grep %s 2>&1", VOLUME_NAMES[i]);
        commands.push_back(login ? ssh_command(job, *login, remote) : NO_SSH_LOGIN);
        DebugLog("--->[%s]\n", commands.back().value_or("").c_str());
    }
    for (int i = 0; i < VOLUMES; ++i) {
        const auto line = reply_of(commands[i]);
        if (!line) return;
        DebugLog("[%s]\n", line->c_str());
        size_of_df_line(*line, free[i]);
    }
    for (const SizeText &text : free)
        DebugLog("--->[%s]\n", text);
}

int rsync_remote_has_du(const std::string &command)
{
    ShellReader reply(command);
    std::string line;
    reply.read_line(line);
    reply.close();
    trim_right(line);
    return line == "/usr/bin/du" ? 1 : 0;
}

void measure_remote_folder(const RsyncJob &job, const std::string &folder, SizeText &size)
{
    if (job.remote_ip[0] == '\0') return;
    if (refusal_for_shells("remote folder", folder)) {
        copy_text(size, UNKNOWN_SIZE);
        return;
    }
    const Checked escaped = shell_path("remote folder", folder);
    const Checked command = escaped ? du_command(job, *escaped) : escaped;
    DebugLog("--->[%s]\n", command.value_or("").c_str());
    if (!command && ssh_login_of(job)) copy_text(size, UNKNOWN_SIZE); // refused
    const auto line = reply_of(command);
    if (line) size_of_du_reply(*line, size);
}

void rsync_remote_free_space(SizeText (&free)[VOLUMES])
{
    measure_remote_free_space(CurrentJob, free);
}

void rsync_remote_du(const std::string &folder, SizeText &size)
{
    measure_remote_folder(CurrentJob, folder, size);
}

void rsync_local_du(char *folders, SizeText &size)
{
    const auto command = local_du_command(folders);
    if (!command) {
        copy_text(size, UNKNOWN_SIZE);
        return;
    }
    ShellReader reply(*command);
    if (!reply.started()) return;
    std::string last;
    for (std::string line; reply.read_line(line);)
        last = line;
    reply.close();
    trim_right(last);
    size_of_du_reply(last, size);
}

} // namespace bakjob
