#include "client_failure.h"
#include "commands.h"
#include "output.h"

namespace quorvel::tools {

void add_regulatory_images(CLI::App& app, CommandLine& line) {
  CLI::App* command = add_command(app, {"regulatory-images", "Ask the daemon for the regulatory images and print them",
                                        "  quorvelctl regulatory-images\n"
                                        "  quorvelctl --root /tmp/device regulatory-images --json"});
  command->callback([&line] {
    line.run = [&line] {
      const client::Reply reply = client::Client().copy_regulatory_images();
      if (reply.error) throw unreachable(*reply.error, "the daemon", "quorveld");
      if (reply.value) return print_value(reply.value, line.json);
      return print_no_value(
          "the device has no regulatory images. Provision them as "
          "/private/var/mobile/Library/qvd/regulatory_images/regulatory_images.plist, for example with: "
          "quorvelctl plist write",
          line.json);
    };
  });
}

}  // namespace quorvel::tools
