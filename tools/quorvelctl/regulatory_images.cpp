#include <optional>

#include "client_failure.h"
#include "commands.h"
#include "files.h"
#include "output.h"
#include "platform/device_paths.h"

namespace quorvel::tools {

namespace {

// The reason as far as the caller can see it from outside.
std::string why_none() {
  const std::string path = paths::kRegulatoryImages;
  try {
    const std::optional<PropertyValue> images = read_device_plist(path, Links::refused);
    if (!images) return "Provision them with: quorvelctl plist write " + ordinary_path(path);
    if (!images->is_dictionary()) return path + " is there, but holds no dictionary";
    return "See why with: quorvelctl log -n 20";
  } catch (const Failure& failure) {
    return failure.message;
  }
}

}  // namespace

void add_regulatory_images(CLI::App& app, CommandLine& line) {
  CLI::App& command = add_command(app, {"regulatory-images", "Ask the daemon for the regulatory images and print them",
                                        "  quorvelctl regulatory-images\n"
                                        "  quorvelctl --root /tmp/device regulatory-images --json"});
  when_chosen(command, [&line] {
    line.run = [&line] {
      const client::Reply reply = client::Client().copy_regulatory_images();
      if (reply.error) throw unreachable(*reply.error, "the daemon", "quorveld");
      if (reply.value) return print_value(reply.value, line.json);
      return print_no_value(std::string("the daemon has no regulatory images to give. ") + why_none(), line.json);
    };
  });
}

}  // namespace quorvel::tools
