#include <CLI/CLI.hpp>
#include <cstdio>
#include <memory>
#include <string>

#include "commands/Commands.h"
#include "media/Text.h"
#include "plugin/FilterHost.h"

namespace tfxtool {
namespace {

std::string JsonString(const std::string& s) {
  std::string out = "\"";
  for (char c : s) {
    const unsigned char u = static_cast<unsigned char>(c);
    if (c == '"' || c == '\\') {
      out += '\\';
      out += c;
    } else if (u < 0x20) {
      char buf[8];
      std::snprintf(buf, sizeof buf, "\\u%04x", u);
      out += buf;
    } else {
      out += c;
    }
  }
  return out + "\"";
}

std::string Aliases(const std::string& guid) {
  std::string names;
  if (const FilterInfo* info = FindFilterByGuid(guid)) {
    for (const char* alias : info->aliases)
      names += (names.empty() ? "" : ", ") + std::string(alias);
  }
  return names;
}

void PrintJson(const std::vector<PublishedFilter>& filters) {
  std::string out = "{\"filters\": [";
  for (size_t f = 0; f < filters.size(); ++f) {
    const PublishedFilter& filter = filters[f];
    const FilterInfo* info = FindFilterByGuid(filter.guid);
    out += f ? ",\n  " : "\n  ";
    out += "{\"index\": " + std::to_string(filter.index) +
           ", \"guid\": " + JsonString(filter.guid) + ", \"name\": " + JsonString(filter.name) +
           ", \"aliases\": [";
    if (info) {
      for (size_t a = 0; a < info->aliases.size(); ++a) {
        out += (a ? ", " : "") + JsonString(info->aliases[a]);
      }
    }
    out += "], \"cpu\": " + std::string(filter.cpu ? "true" : "false") +
           ", \"opencl\": " + (filter.opencl ? "true" : "false") +
           ", \"summary\": " + JsonString(info ? info->summary : "") + ", \"parameters\": [";
    for (size_t p = 0; p < filter.params.size(); ++p) {
      const FilterParam& param = filter.params[p];
      out += p ? ",\n    " : "\n    ";
      out += "{\"name\": " + JsonString(param.name) +
             ", \"type\": " + JsonString(ParamTypeName(param.type));
      if (param.type == ParamType::kString) {
        out += ", \"default\": \"\"";
      } else {
        out += ", \"default\": " + FormatNumber(param.defaultValue) +
               ", \"min\": " + FormatNumber(param.min) + ", \"max\": " + FormatNumber(param.max);
      }
      out += ", \"registered\": " + std::string(param.registered ? "true" : "false") +
             ", \"meaning\": " + JsonString(param.meaning) + "}";
    }
    out += filter.params.empty() ? "]}" : "\n  ]}";
  }
  out += "\n]}\n";
  std::fputs(out.c_str(), stdout);
}

void PrintText(const std::vector<PublishedFilter>& filters) {
  for (const PublishedFilter& filter : filters) {
    const FilterInfo* info = FindFilterByGuid(filter.guid);
    std::string support;
    if (filter.cpu) support = "CPU";
    if (filter.opencl) support += support.empty() ? "OpenCL" : " OpenCL";
    std::printf("%d  %-24s  %s  %s\n", filter.index, filter.name.c_str(), filter.guid.c_str(),
                support.c_str());
    if (info) std::printf("     %s\n", info->summary);
    const std::string aliases = Aliases(filter.guid);
    if (!aliases.empty()) std::printf("     also registered as: %s\n", aliases.c_str());
    for (const FilterParam& p : filter.params) {
      std::string range = "-";
      std::string def = "\"\"";
      if (p.type != ParamType::kString) {
        range = FormatNumber(p.min) + ".." + FormatNumber(p.max);
        def = FormatNumber(p.defaultValue);
      }
      std::printf("     %-14s %-6s %8s  %-12s %s\n", p.name.c_str(), ParamTypeName(p.type),
                  def.c_str(), range.c_str(), p.meaning.c_str());
    }
  }
}

Status ListFilters(const GlobalOptions& options, bool json) {
  PluginLibrary plugin;
  if (Status s = plugin.Load(options.pluginPath); !s.ok()) return s;
  std::vector<PublishedFilter> filters;
  if (Status s = ReadPublishedFilters(plugin, &filters); !s.ok()) return s;
  if (json) {
    PrintJson(filters);
  } else {
    PrintText(filters);
  }
  return Status::Ok();
}

}  // namespace

void AddListCommand(CLI::App& app, const GlobalOptions& options, std::vector<Command>* commands) {
  CLI::App* list =
      app.add_subcommand("list", "Published filters with their support flags and parameters.");
  auto json = std::make_shared<bool>(false);
  list->add_flag("--json", *json, "the same as one JSON document");
  commands->push_back({list, nullptr, [&options, json] { return ListFilters(options, *json); }});
}

}  // namespace tfxtool
