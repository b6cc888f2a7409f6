// Why a run has failed: what whoever starts it is told, folder by folder.

#include "cli/run_job.h"
#include "common/run_options.h"
#include "remote/reply.h"
#include "remote/ssh_probe.h"
#include "support.h"
#include "transfer/plan.h"

#include <filesystem>

using namespace bakjob;

namespace
{

struct Case {
    Keys keys;
    std::string where; // "here", or the program in whose place the script is
    std::string script;
    Reason reason; // `seen`: in part
};

using Reasons = ApplianceWithShare;

TEST_F(Reasons, TellWhichStepFailedAndWhatWasSeen)
{
    using enum RunStep;
    const std::string refused = "rsync: failed to connect to 10.0.0.1: Connection refused (111)";
    const std::string missing = "rsync: change_dir failed: No such file or directory (2)";
    const std::string denied = "Permission denied (password).";
    const std::string none = "/mnt/HD/HD_a2/None";
    const std::string at_list = "[ $kind != list ] || echo '" + refused + "'";
    const std::string at_write = "[ $kind != write ] || echo '" + missing + "'";
    const std::string at_run = "[ $kind != run ] || exit ";
    const Keys row = keys_of("backup_type=2 inc_enable=1");
    const Keys twice = keys_of("retry=2 retry_interval=1");
    const Keys long_path{{"remote_path", std::string(1000, 'x')}};
    const std::vector<Case> cases = {
        {{{"local_path", none}}, "", "", {.step = FOLDER, .seen = "no share holds [" + none + "]"}},
        {{}, "here", "rm -r " + SHARE, {.step = FOLDER, .seen = SHARE + "] cannot be entered: No such file"}},
        {long_path, "", "", {.step = FOLDER, .seen = "remote_path refused: too long"}},
        {row, "here", "ln -s /etc " + SHARE + "/daily.1", {.step = FOLDER, .seen = "daily.1] is a link"}},
        {keys_of("use_ssh=1"),
         SSH,
         "echo '" + denied + "'",
         {.step = LOGIN, .seen = denied, .code = SSH_DENIED}},
        {keys_of("rsync_pwd=? pwd_encoded=1"), "", "", {.step = PASSWORD, .seen = "it has no plain form"}},
        {{}, RSYNC, at_list, {.step = DAEMON, .seen = refused, .code = REPLY_REFUSED}},
        {keys_of("backup_type=2"), RSYNC, at_write, {.step = TARGET, .seen = missing, .code = REPLY_NO_DIR}},
        {keys_of("remote_path=m/sub"),
         RSYNC,
         at_write,
         {.step = TARGET, .seen = "exit code 255", .code = REPLY_NO_DIR}},
        {keys_of("remote_path=a*b"),
         "",
         "",
         {.step = COMMAND, .seen = "refused: character special to the shell"}},
        {{}, RSYNC, "[ $kind != dry ] || exit 10", {.step = DRY_RUN, .exit_code = 10, .attempt = 1}},
        {twice, RSYNC, at_run + "11", {.step = TRANSFER, .exit_code = 11, .attempt = 2}},
        {twice, RSYNC, at_run + "23", {.step = TRANSFER, .exit_code = 23, .attempt = 1}}};
    for (const Case &one : cases) {
        SetUp();
        const Fake rsync(RSYNC, KIND_OF_CALL + (one.where == RSYNC ? one.script : "") + "\n");
        const Fake ssh(SSH, one.where == SSH ? one.script : "exit 255");
        add_job(one.keys);
        if (one.where == "here") shell(one.script);
        const RunReport report = run_job("daily", false);
        EXPECT_FALSE(report.reason) << report.reason.seen;
        ASSERT_EQ(report.folders.size(), 1U) << one.reason.seen;
        const Reason &reason = report.folders[0].reason;
        EXPECT_EQ(reason.step, one.reason.step) << one.reason.seen << " / " << reason.seen;
        EXPECT_TRUE(has(reason.seen, one.reason.seen));
        EXPECT_EQ(reason.code, one.reason.code) << reason.seen;
        EXPECT_EQ(reason.exit_code, one.reason.exit_code) << reason.seen;
        EXPECT_EQ(reason.attempt, one.reason.attempt) << reason.seen;
    }
}

TEST_F(Reasons, AreOfTheirFolderAndOfTheRunItself)
{
    const Fake rsync(RSYNC, "exit 0\n");
    EXPECT_EQ(run_job("daily", false).reason.step, RunStep::START) << "no such job";
    add_job({{"local_path", SHARE + ":/mnt/HD/HD_a2/None"}});
    const RunReport report = run_job("daily", false);
    ASSERT_EQ(report.folders.size(), 2U);
    EXPECT_FALSE(report.folders[0].reason);
    EXPECT_EQ(report.folders[0].attempts, 1);
    EXPECT_EQ(report.folders[1].reason.folder, "/mnt/HD/HD_a2/None");
    EXPECT_FALSE(report.all_done());
    EXPECT_TRUE(has(bakjob_program("-d -r daily").output, "ERROR: local_path refused: no share holds ["));
    write_file(PID_FILE, "1\n");
    EXPECT_TRUE(has(run_job("daily", false).reason.seen, "is running"));
}

TEST_F(Reasons, AFolderThatALinkReplacesInAProbeIsNotFollowed)
{
    const std::string folder = SHARE + "/x";
    const std::string script = "case $kind in\nwrite) rm -r " + folder + "; ln -s /etc " + folder +
                               " ;;\ndry | run) echo \"$*\" >>/tmp/transfers ;;\nesac\n";
    for (const char *direction : {"1", "2"}) {
        SetUp();
        std::filesystem::remove_all(folder);
        std::filesystem::create_directories(folder);
        const Fake rsync(RSYNC, KIND_OF_CALL + script);
        add_job({{"local_path", folder}, {"backup_type", direction}});
        run_job("daily", false);
        EXPECT_TRUE(has(read_file("/tmp/transfers"), folder));
        EXPECT_FALSE(has(read_file("/tmp/transfers"), " " + folder + "/")) << read_file("/tmp/transfers");
        std::filesystem::remove("/tmp/transfers");
        std::filesystem::remove(folder);
    }
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
        const TransferPlan plan = plan_transfer(job);
        EXPECT_FALSE(plan.refusal);
        EXPECT_TRUE(planned_command(job, job));
        EXPECT_EQ(plan.steps, one.steps);
        EXPECT_EQ(plan.row.size(), one.row);
        EXPECT_EQ(plan.newest.empty(), !plan.has(SNAPSHOTS));
    }
    run_options.recover_seq = 0;
    RsyncJob job = make_job("daily");
    job.server_type = 3;
    EXPECT_EQ(plan_transfer(job).refusal.why, "server_type refused: 3");
    EXPECT_TRUE(plan_transfer(job).steps.empty());
}

} // namespace
