#include "figures.h"

#include <json/value.h>

#include <algorithm>
#include <cmath>
#include <cstdio>

#include "program/program.h"
#include "text.h"

namespace orvel::orveld {
namespace {

constexpr double kMedian = 0.5;
constexpr double kHigh = 0.99;

std::string nameOf(size_t program) {
    return std::string(cgi::programs()[program].name);
}

void metric(std::string& out, const char* name, const char* type, const char* help) {
    out.append("# HELP orveld_").append(name).append(" ").append(help);
    out.append("\n# TYPE orveld_").append(name).append(" ").append(type).append("\n");
}

void sample(std::string& out, const char* name, const std::string& labels, double value) {
    char number[40];
    std::snprintf(number, sizeof number, " %.9g\n", value);
    out.append("orveld_").append(name).append(labels).append(number);
}

void single(std::string& out, const char* name, const char* type, const char* help, double value) {
    metric(out, name, type, help);
    sample(out, name, "", value);
}

std::string label(size_t program, const char* quantile = nullptr) {
    std::string text = "{program=\"" + nameOf(program) + "\"";
    if (quantile != nullptr) text.append(",quantile=\"").append(quantile).append("\"");
    return text + "}";
}

}  // namespace

void Durations::add(std::chrono::nanoseconds time) {
    const double microseconds = std::max(1.0, static_cast<double>(time.count()) / 1000.0);
    const auto step = static_cast<size_t>(std::log2(microseconds) * kSteps);
    ++counts_[std::min(step, counts_.size() - 1)];
    ++all_;
}

double Durations::quantile(double part) const {
    if (all_ == 0) return 0;
    const auto wanted = static_cast<std::uint64_t>(std::ceil(static_cast<double>(all_) * part));
    std::uint64_t seen = 0;
    size_t step = 0;
    while (step + 1 < counts_.size() && (seen += counts_[step]) < wanted) ++step;
    return std::exp2((static_cast<double>(step) + 0.5) / kSteps) / 1e6;
}

std::string figuresAsJson(const Figures& figures) {
    Json::Value whole;
    whole["started"] = Json::UInt64(figures.started);
    whole["reading"] = Json::UInt64(figures.reading);
    whole["queued"] = Json::UInt64(figures.queued);
    whole["running"] = Json::UInt64(figures.running);
    whole["served"] = Json::UInt64(figures.served);
    whole["refused"] = Json::UInt64(figures.refused);
    whole["malformed"] = Json::UInt64(figures.malformed);
    whole["crashed"] = Json::UInt64(figures.crashed);
    whole["abandoned"] = Json::UInt64(figures.abandoned);
    Json::Value& programs = whole["programs"] = Json::Value(Json::objectValue);
    for (size_t i = 0; i < figures.programs.size(); ++i) {
        Json::Value& one = programs[nameOf(i)];
        one["served"] = Json::UInt64(figures.programs[i].served);
        one["p50"] = figures.programs[i].durations.quantile(kMedian);
        one["p99"] = figures.programs[i].durations.quantile(kHigh);
    }
    std::string out;
    cgi::appendJson(whole, out);
    return out;
}

std::string figuresAsText(const Figures& figures) {
    std::string out;
    single(out, "reading", "gauge", "Connections whose request has not arrived.", double(figures.reading));
    single(out, "queued", "gauge", "Requests that wait for a process.", double(figures.queued));
    single(out, "running", "gauge", "Requests that are served now.", double(figures.running));
    single(out, "refused_total", "counter", "Requests refused for a limit.", double(figures.refused));
    single(out, "malformed_total", "counter", "Connections that brought no request.", double(figures.malformed));
    single(out, "crashed_total", "counter", "Requests whose process crashed.", double(figures.crashed));
    single(out, "abandoned_total", "counter", "Requests whose client went away.", double(figures.abandoned));
    metric(out, "requests_total", "counter", "Requests served.");
    for (size_t i = 0; i < figures.programs.size(); ++i) {
        sample(out, "requests_total", label(i), double(figures.programs[i].served));
    }
    metric(out, "request_seconds", "summary", "From the connection to the reply.");
    for (size_t i = 0; i < figures.programs.size(); ++i) {
        const ProgramFigures& one = figures.programs[i];
        sample(out, "request_seconds", label(i, "0.5"), one.durations.quantile(kMedian));
        sample(out, "request_seconds", label(i, "0.99"), one.durations.quantile(kHigh));
        sample(out, "request_seconds_count", label(i), double(one.served));
    }
    return out;
}

}  // namespace orvel::orveld
