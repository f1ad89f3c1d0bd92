#include <CLI/CLI.hpp>

#include "commands/Commands.h"

namespace tfxtool {

void AddStepOptions(CLI::App* command, StepList* list) {
  // Each occurrence is handled as it is read, so that a -p lands on the -f before it.
  command
      ->add_option_function<std::string>(
          "-f,--filter",
          [list](const std::string& name) {
            list->steps.push_back({name, {}});
          },
          "a filter of the chain; repeat for more, run in the order given")
      ->type_name("FILTER")
      ->trigger_on_parse()
      ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
  command
      ->add_option_function<std::string>(
          "-p,--param",
          [list](const std::string& setting) {
            (list->steps.empty() ? list->leading : list->steps.back().params).push_back(setting);
          },
          "a setting of the filter before it; the last of a name wins")
      ->type_name("NAME=VALUE")
      ->trigger_on_parse()
      ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
}

}  // namespace tfxtool
