// The small files that a new device root starts with, as JSON.
#pragma once

namespace quorvel::tools {

struct SampleFile {
  const char* directory;
  const char* name;
  const char* json;
};

inline constexpr SampleFile kSampleFiles[] = {
    {"private/var/mobile/Library/qvd/regulatory_images", "regulatory_images.plist", R"({
      "Version": 1,
      "Updated": {"$date": "2026-01-31T12:00:00Z"},
      "Images": [
        {"Region": "EU", "Mark": "CE", "Format": "pbm", "Image": {"$data": "UDEKMTMgNwowIDEgMSAxIDEgMSAwIDAgMCAxIDEgMSAxCjEgMCAwIDAgMCAwIDAgMCAxIDAgMCAwIDAKMSAwIDAgMCAwIDAgMCAwIDEgMCAwIDAgMAoxIDAgMCAwIDAgMCAwIDAgMSAxIDEgMSAwCjEgMCAwIDAgMCAwIDAgMCAxIDAgMCAwIDAKMSAwIDAgMCAwIDAgMCAwIDEgMCAwIDAgMAowIDEgMSAxIDEgMSAwIDAgMCAxIDEgMSAxCg=="}},
        {"Region": "US", "Mark": "FCC", "Identifier": "SAMPLE-0001"}
      ]
    })"},
    {"etc/quorvel", "device_information.plist", R"({
      "ProductType": "Sample1,1",
      "HasBaseband": true,
      "ReleaseType": "Sample",
      "ProductVersion": "1.0",
      "BuildVersion": "1A1",
      "SerialNumber": "SAMPLE000001",
      "marketing-name": "Sample Device",
      "BatteryIsCharging": false,
      "BatteryCurrentCapacity": 80
    })"},
};

}  // namespace quorvel::tools
