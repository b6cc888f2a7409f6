// Why a run has failed: what whoever starts it is told, folder by folder.

#include "cli/run_job.h"
#include "common/run_options.h"
#include "remote/reply.h"
#include "remote/ssh_probe.h"
#include "support.h"
#include "transfer/plan.h"

#include <filesystem>

using namespace bakjob;
namespace fs = std::filesystem;

namespace
{

constexpr const char *FOLDER = "/mnt/HD/HD_a2/Public";

struct Case {
    Keys keys;
    std::string prepared_by; // shell
    std::string rsync;       // case branches: what it does for one kind of call
    std::string ssh;
    Reason reason; // `seen`: in part
};

// What rsync is called for: list and write (the probes), dry and run.
std::string rsync_script(const std::string &branches)
{
    return "case $* in\n*--job-name=*--dry-run*) kind=dry ;;\n*--job-name=*) kind=run ;;\n"
           "*--dry-run*) kind=write ;;\n*) kind=list ;;\nesac\ncase $kind in\n" +
           branches + "\n*) ;;\nesac\n";
}

class Reasons : public Appliance
{
protected:
    void SetUp() override
    {
        Appliance::SetUp();
        add_share("Public", FOLDER);
        store_save();
        fs::create_directories(FOLDER);
    }
};

TEST_F(Reasons, TellWhichStepFailedAndWhatWasSeen)
{
    const std::string refused = "rsync: failed to connect to 10.0.0.1: Connection refused (111)";
    const std::string missing = "rsync: change_dir failed: No such file or directory (2)";
    const std::string says = "echo \"";
    const std::vector<Case> cases = {
        {{{"local_path", "/mnt/HD/HD_a2/None"}},
         "",
         "",
         "",
         {.step = RunStep::FOLDER, .seen = "no share holds [/mnt/HD/HD_a2/None]"}},
        {{},
         std::string("rm -r ") + FOLDER,
         "",
         "",
         {.step = RunStep::FOLDER, .seen = "share [/mnt/HD/HD_a2/Public] cannot be entered: No such file"}},
        {{{"remote_path", std::string(1000, 'x')}},
         "",
         "",
         "",
         {.step = RunStep::FOLDER, .seen = "remote_path refused: too long"}},
        {{{"backup_type", "2"}, {"inc_enable", "1"}},
         std::string("ln -s /etc ") + FOLDER + "/daily.1",
         "",
         "",
         {.step = RunStep::FOLDER, .seen = "daily.1] is a link"}},
        {{{"use_ssh", "1"}},
         "",
         "",
         says + "Permission denied (password).\"",
         {.step = RunStep::LOGIN, .seen = "Permission denied (password).", .code = SSH_DENIED}},
        {{{"rsync_pwd", "?"}, {"pwd_encoded", "1"}},
         "",
         "",
         "",
         {.step = RunStep::PASSWORD, .seen = "rsync_pwd refused: it has no plain form"}},
        {{},
         "",
         "list) " + says + refused + "\" ;;",
         "",
         {.step = RunStep::DAEMON, .seen = refused, .code = REPLY_REFUSED}},
        {{{"backup_type", "2"}},
         "",
         "write) " + says + missing + "\" ;;",
         "",
         {.step = RunStep::TARGET, .seen = missing, .code = REPLY_NO_DIR}},
        {{{"remote_path", "backup/sub"}},
         "",
         "write) " + says + missing + "\" ;;",
         "exit 255",
         {.step = RunStep::TARGET, .seen = "was not fetched: exit code 255", .code = REPLY_NO_DIR}},
        {{{"remote_path", "a*b"}},
         "",
         "",
         "",
         {.step = RunStep::COMMAND, .seen = "remote_path refused: character special to the shell"}},
        {{}, "", "dry) exit 10 ;;", "", {.step = RunStep::DRY_RUN, .exit_code = 10, .attempt = 1}},
        {{{"retry", "2"}, {"retry_interval", "1"}},
         "",
         "run) exit 11 ;;",
         "",
         {.step = RunStep::TRANSFER, .exit_code = 11, .attempt = 2}},
        {{{"retry", "2"}},
         "",
         "run) exit 23 ;;",
         "",
         {.step = RunStep::TRANSFER, .exit_code = 23, .attempt = 1}},
    };
    for (const Case &one : cases) {
        SetUp();
        const Fake rsync("/usr/sbin/rsync", rsync_script(one.rsync));
        const Fake ssh("/usr/sbin/ssh", one.ssh + '\n');
        Keys keys = {{"retry", "0"}};
        for (const auto &[key, value] : one.keys)
            keys[key] = value;
        add_job(keys);
        shell(one.prepared_by);
        const RunReport report = run_job("daily", false);
        EXPECT_FALSE(report.reason) << report.reason.seen;
        ASSERT_EQ(report.folders.size(), 1U) << one.reason.seen;
        const Reason &reason = report.folders[0].reason;
        EXPECT_EQ(reason.step, one.reason.step) << one.reason.seen << " / " << reason.seen;
        EXPECT_NE(reason.seen.find(one.reason.seen), std::string::npos) << reason.seen;
        EXPECT_EQ(reason.code, one.reason.code) << reason.seen;
        EXPECT_EQ(reason.exit_code, one.reason.exit_code) << reason.seen;
        EXPECT_EQ(reason.attempt, one.reason.attempt) << reason.seen;
    }
}

TEST_F(Reasons, AreOfTheirFolderAndOfTheRunItself)
{
    const Fake rsync("/usr/sbin/rsync", "exit 0\n");
    EXPECT_EQ(run_job("daily", false).reason.step, RunStep::START) << "no such job";
    add_job({{"local_path", std::string(FOLDER) + ":/mnt/HD/HD_a2/None"}});
    const RunReport report = run_job("daily", false);
    ASSERT_EQ(report.folders.size(), 2U);
    EXPECT_FALSE(report.folders[0].reason);
    EXPECT_EQ(report.folders[0].attempts, 1);
    EXPECT_EQ(report.folders[1].reason.folder, "/mnt/HD/HD_a2/None");
    EXPECT_FALSE(report.all_done());
    EXPECT_NE(bakjob_program("-d -r daily").output.find("ERROR: local_path refused: no share holds ["),
              std::string::npos);
    write_file("/var/run/bakjob_daily.pid", "1\n");
    EXPECT_NE(run_job("daily", false).reason.seen.find("is running"), std::string::npos);
}

TEST_F(Reasons, ThePlanSaysWhatWillBeDone)
{
    using enum RunStep;
    struct Plan {
        int use_ssh, backup_type, inc_enable, recover;
        std::vector<RunStep> steps;
        std::size_t row;
    };
    const std::vector<Plan> plans = {
        {0, BACKUP_PUSH, 0, 0, {PASSWORD, DAEMON, TARGET, COMMAND, TRANSFER}, 0},
        {1, BACKUP_PUSH, 1, 0, {LOGIN, PASSWORD, DAEMON, TARGET, COMMAND, TRANSFER}, 0},
        {0, BACKUP_PULL, 1, 0, {PASSWORD, DAEMON, TARGET, COMMAND, SNAPSHOTS, TRANSFER}, 4},
        {0, BACKUP_PULL, 1, 2, {PASSWORD, TARGET, COMMAND, TRANSFER}, 1},
    };
    for (const Plan &one : plans) {
        RsyncJob job = make_job("daily");
        job.use_ssh = one.use_ssh;
        job.backup_type = one.backup_type;
        job.inc_enable = one.inc_enable;
        job.inc_number = 4;
        run_options.recover_seq = one.recover;
        const TransferPlan plan = plan_transfer(job, job);
        EXPECT_FALSE(plan.refusal);
        EXPECT_TRUE(plan.command) << plan.command.refusal().why;
        EXPECT_EQ(plan.steps, one.steps);
        EXPECT_EQ(plan.row.size(), one.row);
        EXPECT_EQ(plan.newest.empty(), !plan.has(SNAPSHOTS));
    }
    run_options.recover_seq = 0;
    RsyncJob job = make_job("daily");
    job.server_type = 3;
    EXPECT_EQ(plan_transfer(job, job).refusal.why, "server_type refused: 3");
    EXPECT_TRUE(plan_transfer(job, job).steps.empty());
}

} // namespace
