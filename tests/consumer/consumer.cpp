// SPDX-License-Identifier: Apache-2.0
// Decodes a statistics capture and looks the controller up, as a client in C++.

#include <ksp/ksp.h>
#include <ksp/platform/driver_service.h>
#include <fstream>
#include <iostream>
#include <iterator>
#include <ksp/entries.hpp>
#include <ksp/records.hpp>
#include <vector>

int main(int argc, char** argv) {
  if (argc < 2) return 1;
  std::ifstream file(argv[1], std::ios::binary);
  const std::vector<char> stream(std::istreambuf_iterator<char>(file), {});

  ExporterEntry* entry = nullptr;
  const uint32_t service = findNandExporter(&entry);
  if (service == 0 || ReleaseServiceObject(service) != 0) return 2;

  ksp::GenericContext context;
  const uint32_t total =
      KSPFTLParseBufferToCxt(context.get(), stream.data(), static_cast<uint32_t>(stream.size()));
  const auto [name, value] = *ksp::entries(context).begin();

  // The same without a context.
  ksp::StatisticsRecords records(stream.data(), stream.size());
  const ksp::RecordName first = records.begin()->name();
  if (first.view() != name) return 3;
  uint64_t values = 0;
  for (const ksp::Record& record : records) values += record.elements.size();
  if (values != total || records.ending().reason != ksp::EndReason::kComplete) return 4;

  std::cout << total << " values, first " << name << " = " << value << ", " << GetAPIErrorMessage() << '\n';
}
