// Whatever a job's values hold, and whatever the remote side calls its modules: none of it becomes a command,
// an option or a file elsewhere.

#include "soak_support.h"

#include <algorithm>
#include <filesystem>

namespace fs = std::filesystem;

namespace
{

// Names and contents of everything outside of a job's own places.
std::string elsewhere()
{
    const std::string own =
        "\\( -path 'tmp/r_*' -o -path tmp/output -o -path 'tmp/rsync_*' -o -path etc/NAS_CFG -o -path "
        "remote/backup "
        "-o -path remote/data -o -path mnt/HD/HD_a2/Public \\) -prune -o -type f -printf '%p %s %T@\\n' -o "
        "-printf '%p\\n' 2>/dev/null";
    return shell("cd / && { find tmp mnt remote home srv -xdev -mindepth 1 " + own +
                 "; find etc root run -xdev -mindepth 1 -maxdepth 1 " + own + "; } | sort")
        .output;
}

// clang-format off
const std::vector<std::string> PAYLOADS = {
    ";touch /tmp/pwned;", "|touch /tmp/pwned", "&touch /tmp/pwned&", "&&touch /tmp/pwned",
    "||touch /tmp/pwned", "$(touch /tmp/pwned)", "`touch /tmp/pwned`", "'; touch /tmp/pwned; '",
    "\"; touch /tmp/pwned; \"", "' $(touch /tmp/pwned) '", "\" `touch /tmp/pwned` \"",
    "\\\"; touch /tmp/pwned; \\\"", "x\ntouch /tmp/pwned\n", "x\rtouch /tmp/pwned", ">/tmp/pwned",
    ">>/tmp/pwned", "</dev/zero", "2>/tmp/pwned", "*", "?[a-z]*", "{a,b}", "~root",
    "-oProxyCommand=touch /tmp/pwned", "-e touch${IFS}/tmp/pwned", "--rsync-path=touch /tmp/pwned",
    "--rsh=touch${IFS}/tmp/pwned", "-rf", "../../../../tmp/pwned", "/../../../../tmp/pwned", "a\tb", " ",
    "", "${HOME}", "$$", "!!", "#", "%s%s%s%n", "f\xc3\xbc\xc3\x9f", "\xff\xfe\x80",
    std::string(3000, 'A'), std::string(200, '$')};
// clang-format on

struct KindOfRun {
    std::string name;
    std::vector<std::string> arguments; // in front of -r and the name
    Keys keys;
};

const Keys SNAPSHOTS = keys_of("backup_type=2 inc_enable=1");
const Keys BY_SSH = keys_of("use_ssh=1 rsync_mode=1 ssh_pwd=rootpw remote_path=/remote/data rsync_user=root");
const std::vector<KindOfRun> KINDS = {{"push", {}, {}},
                                      {"fetch", {}, SNAPSHOTS},
                                      {"ssh", {}, BY_SSH},
                                      {"restore", {"-i", "x"}, {}},
                                      {"recover", {"-n", "1"}, SNAPSHOTS}};

// Whether a failed run says why: by a refusal, or by the command that it tried last.
bool is_explained(const std::string &trace, const std::string &field, const std::string &value)
{
    if (field == "remote_ip" && value.empty()) return true; // nothing to say about no host
    const bool hostile = value.find_first_of("\"\\|<>*?\t\n\r") != std::string::npos;
    if (hostile && (field == "remote_ip" || field == "remote_path"))
        return trace.find("ERROR: " + field + " refused") != std::string::npos;
    const std::vector<std::string> reasons = {"ERROR: ", "--->[r",        "--->[s",
                                              "--->[@",  "rsync_cmd = [", "denied"};
    return std::any_of(reasons.begin(), reasons.end(),
                       [&](const std::string &reason) { return trace.find(reason) != std::string::npos; });
}

// Around the payload, what the field needs to be looked at.
std::string value_of(const std::string &field, const std::string &payload, const KindOfRun &kind)
{
    if (field == "local_path") return SHARE + "/" + payload;
    if (field == "rsync_pwd_file") return "/tmp/r_" + payload;
    if (field == "remote_path") return (kind.name == "ssh" ? "/remote/data/" : "backup/") + payload;
    return payload;
}

// Whether such a job runs, or fails and says why, and nothing is touched elsewhere.
bool run_stays_at_home(const KindOfRun &kind, const std::string &field, const std::string &value)
{
    Keys keys = kind.keys;
    keys[field] = value;
    const int item = add_job(keys);
    const std::string name = job_key(item, "job_name");
    const bool is_file_name = name.size() < 100 && name.find('/') == std::string::npos;
    fs::create_directories(SHARE + "/" + (is_file_name ? name : "x") + ".0");
    std::vector<std::string> arguments = kind.arguments;
    arguments.insert(arguments.end(), {"-r", name});
    const std::string before = elsewhere();
    const std::string trace = traced(arguments);
    const std::string state = job_key(item, "state") + job_key(item, "rstate");
    const bool done = state == "20" || state == "02";
    const bool failed = state == "40" || state == "04" || state == "90" || state == "00";
    const bool no_snapshot = kind.name == "recover" && state == "00";
    wait_for(start({"-k", name}));
    const bool ended = done || no_snapshot || (failed && is_explained(trace, field, value));
    if (ended && elsewhere() == before && !exists("/tmp/pwned")) return true;
    ADD_FAILURE() << field << " [" << value.substr(0, 60) << "] " << kind.name << " state " << state << "\n"
                  << trace;
    return false;
}

} // namespace

TEST_F(Holds, NoValueBecomesACommand)
{
    const std::vector<std::string> fields = {"job_name",   "rsync_user",  "ssh_user",
                                             "ssh_pwd",    "remote_ip",   "port",
                                             "local_path", "remote_path", "rsync_pwd_file"};
    int tries = 0;
    int failures = 0;
    for (std::size_t f = 0; f < fields.size(); ++f) {
        for (std::size_t p = 0; p < PAYLOADS.size(); ++p) {
            for (std::size_t k = 0; k < KINDS.size(); ++k) {
                // In the tests every pair of field and kind, not every triple.
                if (soak_table() == nullptr && (f * 7 + p) % 15 != k * 3) continue;
                SetUp();
                ++tries;
                const std::string value = value_of(fields[f], PAYLOADS[p], KINDS[k]);
                failures += run_stays_at_home(KINDS[k], fields[f], value) ? 0 : 1;
            }
        }
    }
    expect_none_of(tries, failures, "hostile values in a job's fields");
}

TEST_F(Holds, NoModuleOfTheRemoteSideBecomesACommand)
{
    const std::string own_config = read_file("/etc/rsyncd.conf");
    int tries = 0;
    int failures = 0;
    for (std::size_t p = 0; p < PAYLOADS.size(); p += static_cast<std::size_t>(rounds(6, 1))) {
        SetUp();
        add_job({{"ssh_pwd", "cm9vdHB3"}, {"remote_path", "backup"}});
        write_file("/etc/rsyncd.conf", "[ " + PAYLOADS[p] +
                                           " ]\npath = /x\n[ backup ]\npath = /remote/backup/" + PAYLOADS[p] +
                                           "\n");
        const std::string before = elsewhere();
        const std::string trace = traced({"-r", "daily"});
        ++tries;
        if (elsewhere() == before && !exists("/tmp/pwned") && job_key(1, "state") != "12") continue;
        ++failures;
        ADD_FAILURE() << PAYLOADS[p].substr(0, 60) << trace;
    }
    write_file("/etc/rsyncd.conf", own_config);
    expect_none_of(tries, failures, "hostile module names and paths");
}
