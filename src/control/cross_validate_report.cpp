// The tables of a cross-validation: per level, and per sweep combination.
#include "control/cross_validate_run.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <string>

namespace karnet {
namespace {

std::string format(const char* pattern, ...) __attribute__((format(printf, 1, 2)));

std::string format(const char* pattern, ...) {
  char buffer[512];
  va_list arguments;
  va_start(arguments, pattern);
  std::vsnprintf(buffer, sizeof buffer, pattern, arguments);
  va_end(arguments);
  return buffer;
}

// Depth below the surface of local level l: level l lies at height
// (l - lx - 1) * dz.
double levelDepth(std::int32_t l, const RunSettings& s) {
  return static_cast<double>(s.lx + 1 - l) * static_cast<double>(s.dz);
}

// rms and bias as CSV fields; empty when no node was compared.
std::string csvFigures(const CvStats& stats) {
  if (stats.nodes == 0) return ",";
  return format("%.9g,%.9g", stats.rms(), stats.bias());
}

std::string textFigures(const CvStats& stats) {
  if (stats.nodes == 0) return format("%12s %12s", "-", "-");
  return format("%12.6g %12.6g", stats.rms(), stats.bias());
}

}  // namespace

std::string cvLevelCsv(const CvResult& result, const RunSettings& settings) {
  std::string csv = "level,depth_m,nodes,missed,rms,bias\n";
  for (std::size_t i = 0; i < result.levels.size(); ++i) {
    const CvStats& stats = result.levels[i];
    if (stats.nodes == 0 && stats.missed == 0) continue;
    const auto level = static_cast<std::int32_t>(result.firstLevel + static_cast<std::int32_t>(i));
    csv += format("%d,%.9g,%lld,%lld,", level, levelDepth(level, settings),
                  static_cast<long long>(stats.nodes), static_cast<long long>(stats.missed));
    csv += csvFigures(stats) + "\n";
  }
  csv += format("all,,%lld,%lld,", static_cast<long long>(result.overall.nodes),
                static_cast<long long>(result.overall.missed));
  csv += csvFigures(result.overall) + "\n";
  return csv;
}

std::string cvLevelText(const CvResult& result, const RunSettings& settings) {
  std::string text = format("%6s %10s %8s %8s %12s %12s\n", "level", "depth_m", "nodes", "missed",
                            "rms", "bias");
  for (std::size_t i = 0; i < result.levels.size(); ++i) {
    const CvStats& stats = result.levels[i];
    if (stats.nodes == 0 && stats.missed == 0) continue;
    const auto level = static_cast<std::int32_t>(result.firstLevel + static_cast<std::int32_t>(i));
    text += format("%6d %10.6g %8lld %8lld ", level, levelDepth(level, settings),
                   static_cast<long long>(stats.nodes), static_cast<long long>(stats.missed));
    text += textFigures(stats) + "\n";
  }
  text += format("%6s %10s %8lld %8lld ", "all", "", static_cast<long long>(result.overall.nodes),
                 static_cast<long long>(result.overall.missed));
  text += textFigures(result.overall) + "\n";
  return text;
}

std::int64_t bestTrial(const std::vector<CvResult>& results) {
  // RMS errors over different sets of nodes do not compare: a search radius
  // that leaves the hard, isolated casts without an estimate would look best.
  // So only the trials that compared the most nodes compete.
  std::int64_t most = 0;
  for (const CvResult& r : results) most = std::max(most, r.overall.nodes);
  std::int64_t best = -1;
  for (std::size_t t = 0; t < results.size(); ++t) {
    const CvStats& overall = results[t].overall;
    if (overall.nodes == 0 || overall.nodes < most) continue;
    if (best < 0 || overall.rms() < results[static_cast<std::size_t>(best)].overall.rms()) {
      best = static_cast<std::int64_t>(t);
    }
  }
  return best;
}

std::string cvSweepCsv(const std::vector<CvResult>& results, const std::vector<RunSettings>& trials,
                       const std::vector<SweepKeyword>& sweep) {
  std::string csv;
  for (const SweepKeyword& keyword : sweep) csv += keyword.name + ",";
  csv += "nodes,missed,rms,bias,best\n";
  const std::int64_t best = bestTrial(results);
  for (std::size_t t = 0; t < results.size(); ++t) {
    for (const SweepKeyword& keyword : sweep) {
      csv += format("%.9g,", sweptValue(trials[t], keyword.name));
    }
    const CvStats& overall = results[t].overall;
    csv += format("%lld,%lld,", static_cast<long long>(overall.nodes),
                  static_cast<long long>(overall.missed));
    csv += csvFigures(overall);
    csv += static_cast<std::int64_t>(t) == best ? ",*\n" : ",\n";
  }
  return csv;
}

std::string cvSweepText(const std::vector<CvResult>& results,
                        const std::vector<RunSettings>& trials,
                        const std::vector<SweepKeyword>& sweep) {
  std::string text;
  for (const SweepKeyword& keyword : sweep) text += format("%22s ", keyword.name.c_str());
  text += format("%8s %8s %12s %12s\n", "nodes", "missed", "rms", "bias");
  const std::int64_t best = bestTrial(results);
  for (std::size_t t = 0; t < results.size(); ++t) {
    for (const SweepKeyword& keyword : sweep) {
      text += format("%22.9g ", sweptValue(trials[t], keyword.name));
    }
    const CvStats& overall = results[t].overall;
    text += format("%8lld %8lld ", static_cast<long long>(overall.nodes),
                   static_cast<long long>(overall.missed));
    text += textFigures(overall);
    text += static_cast<std::int64_t>(t) == best ? "  <- best\n" : "\n";
  }
  for (const CvResult& r : results) {
    if (r.overall.nodes != results.front().overall.nodes) {
      text += "The combinations compare different numbers of nodes; the best is the lowest RMS\n"
              "among those that compare the most.\n";
      break;
    }
  }
  return text;
}

}  // namespace karnet
