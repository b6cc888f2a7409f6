// list, show, status, keys: what there is and how it stands.

#include "jobs/commands.h"
#include "jobs/fields.h"
#include "jobs/summary.h"
#include "output/failure.h"

#include <algorithm>
#include <nlohmann/json.hpp>

namespace bakjob::ctl
{

namespace
{

void print_json_list(const std::vector<Summary> &summaries)
{
    Json list = Json::array();
    for (const Summary &summary : summaries) {
        list.push_back(json_of(summary));
    }
    print_json(list);
}

std::vector<Summary> summaries_of(const std::vector<StoredJob> &jobs)
{
    std::vector<Summary> summaries;
    std::transform(jobs.begin(), jobs.end(), std::back_inserter(summaries), summary_of);
    return summaries;
}

int exit_status_of(const std::vector<Summary> &summaries)
{
    const auto any = [&](Outcome outcome) {
        return std::any_of(summaries.begin(), summaries.end(),
                           [&](const Summary &summary) { return summary.outcome == outcome; });
    };
    if (any(Outcome::FAILED)) return EXIT_TROUBLE;
    return any(Outcome::RUNNING) ? EXIT_RUNNING : EXIT_FINE;
}

Json json_of_record(const StoredJob &job)
{
    Json keys;
    for (const JobField &field : job_fields()) {
        if (is_secret(field)) {
            keys[field.key] = *text_field(job.record, field) != '\0';
        } else if (field.is_text()) {
            keys[field.key] = text_field(job.record, field);
        } else {
            keys[field.key] = integer_field(job.record, field);
        }
    }
    Json all = json_of(summary_of(job));
    all["keys"] = keys;
    return all;
}

} // namespace

int list_jobs(const Request &request)
{
    const auto summaries = summaries_of(read_jobs());
    if (request.json) {
        print_json_list(summaries);
        return EXIT_FINE;
    }
    std::vector<Row> rows;
    for (const Summary &summary : summaries) {
        if (request.names) {
            rows.push_back({summary.name});
        } else {
            rows.push_back({summary.name, summary.direction, summary.remote, summary.enabled ? "yes" : "no",
                            summary.run == Run::GOING_ON ? "yes" : "no", summary.last, summary.time});
        }
    }
    const Row header{"NAME", "DIRECTION", "REMOTE SIDE", "ENABLED", "RUNS NOW", "LAST RUN", "AT"};
    print_table(request.names ? Row{} : header, rows);
    return EXIT_FINE;
}

int show_job(const Request &request)
{
    const StoredJob job = read_job(request.name);
    if (request.json) {
        print_json(json_of_record(job));
        return EXIT_FINE;
    }
    std::vector<Row> rows;
    for (const JobField &field : job_fields()) {
        rows.push_back({field.key, shown_value(job.record, field)});
    }
    const Summary summary = summary_of(job);
    rows.push_back({"last run", summary.last});
    rows.push_back({"runs now", summary.run == Run::GOING_ON ? "yes" : "no"});
    for (const ScheduleEntry &entry : job.schedule) {
        rows.push_back({"timetable", times_of(entry)});
    }
    print_table({}, rows);
    return EXIT_FINE;
}

int show_status(const Request &request)
{
    const auto jobs = !request.named ? read_jobs() : std::vector{read_job(request.name)};
    // A configuration that is lost or damaged reads as empty: that is not fine.
    if (jobs.empty()) throw Failure("there are no jobs");
    const auto summaries = summaries_of(jobs);
    if (request.json) {
        print_json_list(summaries);
        return exit_status_of(summaries);
    }
    std::vector<Row> rows;
    for (const Summary &summary : summaries) {
        const std::string restore =
            summary.restore.empty() ? "" : "restore " + summary.restore + "  " + summary.restore_time;
        rows.push_back(
            {summary.name + ':', summary.last, summary.time, restore, summary.enabled ? "" : "disabled"});
    }
    print_table({}, rows);
    return exit_status_of(summaries);
}

int show_keys(const Request &request)
{
    std::vector<Row> rows;
    Json list = Json::array();
    for (const FieldRule &rule : field_rules()) {
        if (rule.kind == FieldKind::OWN) continue;
        rows.push_back(request.names ? Row{rule.key} : Row{rule.key, rule.meaning});
        if (!request.names) rows.push_back({"", rule.allowed});
        list.push_back({{"key", rule.key}, {"meaning", rule.meaning}, {"allowed", rule.allowed}});
    }
    if (request.json) {
        print_json(list);
    } else {
        print_table(request.names ? Row{} : Row{"KEY", "MEANING, AND WHAT IS ALLOWED"}, rows);
    }
    return EXIT_FINE;
}

} // namespace bakjob::ctl
