// check: what would make a run fail, found before it runs.

#include "check/commands.h"
#include "check/findings.h"
#include "common/job_files.h"
#include "jobs/jobs.h"
#include "output/failure.h"
#include "output/output.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <map>
#include <nlohmann/json.hpp>
#include <string_view>

namespace bakjob::ctl
{

namespace
{

constexpr std::array VERDICTS = {"fine", "note", "problem"};

const char *verdict_of(const Finding &finding)
{
    return VERDICTS.at(static_cast<std::size_t>(finding.verdict));
}

// Advice speaks of the job NAME and its PIDFILE. What is put in their places is not looked at again.
std::string with_name(std::string_view advice, const std::string &name)
{
    const bool option = name.starts_with('-') && advice.starts_with("bakjobctl");
    const auto job = JobName::checked(name);
    const std::map<std::string_view, std::string> words = {
        {"NAME", (option ? "-- " : "") + name_for_shell(name)},
        {"PIDFILE", job ? name_for_shell(pid_file(*job)) : ""},
    };
    std::string text;
    while (!advice.empty()) {
        const auto word = std::find_if(words.begin(), words.end(),
                                       [&](const auto &one) { return advice.starts_with(one.first); });
        text += word == words.end() ? std::string(advice.substr(0, 1)) : word->second;
        advice.remove_prefix(word == words.end() ? 1 : word->first.size());
    }
    return text;
}

void print_findings(const Findings &findings)
{
    for (const Finding &finding : findings) {
        std::printf("%-8s %s: %s\n", verdict_of(finding), printable(finding.about).c_str(),
                    printable(finding.what).c_str());
        if (!finding.todo.empty()) std::printf("         %s\n", printable(finding.todo).c_str());
    }
}

Json json_of(const Findings &findings)
{
    Json list = Json::array();
    for (const Finding &finding : findings) {
        list.push_back({{"verdict", verdict_of(finding)},
                        {"about", finding.about},
                        {"what", finding.what},
                        {"todo", finding.todo}});
    }
    return list;
}

} // namespace

int check_job(const Request &request)
{
    const StoredJob job = read_job(request.name);
    Findings findings;
    check_here(job.record, job.schedule, findings);
    check_local_copies(job.record, findings);
    if (request.probe) check_remote_side(job.record, findings);
    for (Finding &finding : findings) {
        finding.todo = with_name(finding.todo, request.name);
    }
    const auto problems = std::count_if(findings.begin(), findings.end(), [](const Finding &finding) {
        return finding.verdict == Verdict::PROBLEM;
    });
    if (request.json) {
        print_json(json_of(findings));
    } else {
        print_findings(findings);
        std::printf("%s: %td problem%s\n", printable(request.name).c_str(), problems,
                    problems == 1 ? "" : "s");
    }
    return problems == 0 ? EXIT_FINE : EXIT_TROUBLE;
}

} // namespace bakjob::ctl
