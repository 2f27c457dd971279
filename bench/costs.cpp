// Prints what builds cost in platform calls, as the tables of docs/performance.md; with a folder as
// its argument it also draws the plots there.
#include <cmath>
#include <cstdio>
#include <fstream>
#include <iostream>
#include <string>
#include <vector>

#include "bench/build_costs.h"
#include "simulation/machine/generated.h"
#include "simulation/machine/machine_file.h"

namespace {

using namespace bench;
using platform::simulated::GeneratedShape, platform::simulated::GenerateMachine,
    platform::simulated::LoadMachine;
using platform::simulated::Machine;

constexpr std::size_t kSizes[] = {10, 100, 1'000, 10'000};

std::string Format(const char* format, double a, double b = 0) {
  char text[80];
  std::snprintf(text, sizeof text, format, a, b);
  return text;
}

void Row(const std::vector<std::string>& cells) {
  std::string line = "|";
  for (const std::string& cell : cells) line.append(" ").append(cell).append(" |");
  std::cout << line << '\n';
}
void Head(const std::vector<std::string>& cells) {
  std::cout << '\n';
  Row(cells);
  Row(std::vector<std::string>(cells.size(), "---"));
}

std::string Milliseconds(const Cost& cost) {
  return Format("%.1f to %.1f", PriceOf(cost, kQuickHubs) / 1e3, PriceOf(cost, kSlowHubs) / 1e3);
}

std::vector<std::string> Cells(const std::string& pc, const std::string& build, const Cost& cost,
                               std::size_t nodes) {
  std::vector<std::string> cells{pc, build, std::to_string(AllCalls(cost))};
  for (std::size_t kind = 0; kind < kCallKinds; ++kind) {
    cells.push_back(std::to_string(cost.CallsOf(static_cast<CallKind>(kind))));
  }
  cells.push_back(Format("%.1f", CallsForEachNode(cost, nodes)));
  cells.push_back(Milliseconds(cost));
  return cells;
}

struct Line {
  std::string name, colour;
  std::vector<double> values;  // by size
};

// Lines over the sizes, both axes logarithmic.
void Plot(const std::string& path, const std::string& title, double least, double most,
          const std::vector<Line>& lines) {
  constexpr double kWidth = 640, kHeight = 400, kLeft = 80, kBottom = 50, kTop = 40, kRight = 150;
  const auto place = [](double value, double low, double high, double from, double to) {
    return from + (to - from) * std::log10(value / low) / std::log10(high / low);
  };
  const auto x = [&](double value) {
    return place(value, kSizes[0], kSizes[3], kLeft, kWidth - kRight);
  };
  const auto y = [&](double value) { return place(value, least, most, kHeight - kBottom, kTop); };
  std::ofstream svg(path);
  svg << "<svg xmlns=\"http://www.w3.org/2000/svg\" width=\"640\" height=\"400\" "
         "font-family=\"sans-serif\" "
         "font-size=\"12\">\n<rect width=\"640\" height=\"400\" fill=\"white\"/>\n<text x=\"80\" "
         "y=\"22\" "
         "font-size=\"14\">"
      << title << "</text>\n";
  for (const std::size_t size : kSizes) {
    const double at = x(static_cast<double>(size));
    svg << Format("<line x1=\"%.1f\" x2=\"%.1f\" ", at, at)
        << "y1=\"40\" y2=\"350\" stroke=\"#ddd\"/>\n"
        << Format("<text x=\"%.1f\" y=\"368\" text-anchor=\"middle\">", at) << size << "</text>\n";
  }
  for (double value = least; value <= most * 1.01; value *= 10) {
    svg << Format("<line y1=\"%.1f\" y2=\"%.1f\" ", y(value), y(value))
        << "x1=\"80\" x2=\"490\" stroke=\"#ddd\"/>\n"
        << Format("<text x=\"74\" y=\"%.1f\" text-anchor=\"end\">%.0f</text>\n", y(value) + 4,
                  value);
  }
  svg << "<text x=\"285\" y=\"390\" text-anchor=\"middle\">devices plugged in</text>\n";
  for (const Line& line : lines) {
    svg << "<polyline fill=\"none\" stroke-width=\"2\" stroke=\"" << line.colour << "\" points=\"";
    for (std::size_t i = 0; i < line.values.size(); ++i) {
      svg << Format("%.1f,%.1f ", x(static_cast<double>(kSizes[i])), y(line.values[i]));
    }
    svg << "\"/>\n"
        << Format("<text x=\"%.1f\" y=\"%.1f\" ", x(static_cast<double>(kSizes[3])) + 6,
                  y(line.values.back()) + 4)
        << "fill=\"" << line.colour << "\">" << line.name << "</text>\n";
  }
  svg << "</svg>\n";
}

}  // namespace

int main(int argc, char** argv) {
  Head({"PC", "build", "calls", "opens", "requests", "sets", "manager", "volumes", "closes",
        "sets and manager for each node", "ms at the prices"});
  std::vector<std::pair<std::string, Machine>> machines;
  for (const char* name : {"dell-precision", "asus-b560", "hp-cardreader", "vmware-win7"}) {
    machines.emplace_back(name,
                          LoadMachine(std::string(ZKUSB_SOURCE_DIR "/machines/") + name + ".json"));
  }
  for (const auto& [name, machine] : machines) {
    const BuildCosts costs = CostsOfBuilds(machine);
    Row(Cells(name, "first", costs.first, costs.deviceNodes));
    Row(Cells(name, "unchanged", costs.unchanged, costs.deviceNodes));
  }

  Head({"PC", "one full query", "devnode walk", "first build", "unchanged build",
        "of these requests to hubs"});
  for (const auto& [name, machine] : machines) {
    const BuildCosts costs = CostsOfBuilds(machine);
    Row({name, std::to_string(AllCalls(CostOfFullQuery(machine))),
         std::to_string(AllCalls(CostOfDevNodeWalk(machine))),
         std::to_string(AllCalls(costs.first)), std::to_string(AllCalls(costs.unchanged)),
         std::to_string(costs.first.CallsOf(CallKind::Request))});
  }

  Head({"shape", "devices", "nodes", "first", "unchanged", "full query",
        "sets and manager for each node", "allocations for each device, first",
        "retained bytes for each node"});
  const Line calls[] = {{"wide, first", "#1f77b4", {}},
                        {"wide, unchanged", "#6baed6", {}},
                        {"deep, first", "#d62728", {}},
                        {"deep, unchanged", "#ff9896", {}},
                        {"wide, full query", "#7f7f7f", {}}};
  std::vector<Line> lines(std::begin(calls), std::end(calls)), prices = lines;
  for (const GeneratedShape shape : {GeneratedShape::Wide, GeneratedShape::Deep}) {
    const bool wide = shape == GeneratedShape::Wide;
    for (const std::size_t devices : kSizes) {
      const Machine machine = GenerateMachine(shape, devices);
      const BuildCosts costs = CostsOfBuilds(machine);
      const Cost query = CostOfFullQuery(machine);
      const auto add = [&](std::size_t line, const Cost& cost) {
        lines[line].values.push_back(static_cast<double>(AllCalls(cost)));
        prices[line].values.push_back(PriceOf(cost, kQuickHubs) / 1e3);
      };
      add(wide ? 0 : 2, costs.first);
      add(wide ? 1 : 3, costs.unchanged);
      if (wide) add(4, query);
      Row({wide ? "wide" : "deep", std::to_string(devices), std::to_string(costs.deviceNodes),
           std::to_string(AllCalls(costs.first)), std::to_string(AllCalls(costs.unchanged)),
           std::to_string(AllCalls(query)),
           Format("%.1f", CallsForEachNode(costs.first, costs.deviceNodes)),
           Format("%.1f",
                  static_cast<double>(costs.first.allocations) / static_cast<double>(devices)),
           Format("%.0f", RetainedBytesForEachNode(machine))});
    }
  }
  if (argc > 1) {
    const std::string folder = argv[1];
    Plot(folder + "/calls.svg", "Platform calls of a build", 100, 10'000'000, lines);
    Plot(folder + "/prices.svg", "Milliseconds of a build, hub requests at 44 us", 1, 100'000,
         prices);
  }
}
