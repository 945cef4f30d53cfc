#include "cli/ThumbnailCommands.h"

#include <CLI/CLI.hpp>

#include "cli/ItemArgument.h"

namespace droxa {

ThumbnailCommands::ThumbnailCommands(CLI::App &app) : app_(app) {
  CLI::App *thumbnail =
      app_.add_subcommand(
              "thumbnail",
              "Writes documents' thumbnails as PNG files, each named after its document, without\n"
              "fetching the documents; says which have none, and why. Ctrl-C cancels")
          ->fallthrough();
  thumbnail
      ->add_option(
          "item", options_.arguments,
          std::string("A document, or a folder, which stands for the documents in it: ") + kItemArgumentHelp)
      ->required();
  thumbnail->add_option("--size", options_.size, "The longest side, in pixels (default: 256)")
      ->type_name("N")
      ->check(CLI::Range(1, 1024));
  thumbnail
      ->add_option("--out", options_.folder,
                   "The folder for the files, which are never written over others (default: this one)")
      ->type_name("DIR");
  thumbnail
      ->add_flag("--cache", options_.fillsCache,
                 "Puts those of what isn't here in the folders into the cache that the desktop's programs\n"
                 "share, instead; listing a folder does that too")
      ->excludes(thumbnail->get_option("--out"))
      ->excludes(thumbnail->get_option("--size"));
  CLI::App *folder =
      app_.add_subcommand("default-folder",
                          "Shows the folder where an application's documents go, and makes it where it is\n"
                          "missing; without an application, the one of everybody's documents")
          ->fallthrough();
  folder
      ->add_option("application", application_,
                   "The application's identifier, as its desktop entry is called (\"org.example.Writer\")")
      ->type_name("APP");
  for (CLI::App *command : {thumbnail, folder})
    command->add_flag("--json", options_.json, "One JSON object a line");
}

bool ThumbnailCommands::canBeStopped() const {
  return app_.got_subcommand("thumbnail");
}

bool ThumbnailCommands::isChosen() const {
  return canBeStopped() || app_.got_subcommand("default-folder");
}

int ThumbnailCommands::run(CommandContext &context) const {
  if (canBeStopped()) return runThumbnail(context, options_);
  const auto application = application_.empty() ? std::nullopt : std::optional(application_);
  return runDefaultFolder(context, application, options_.json);
}

}  // namespace droxa
