// SPDX-License-Identifier: Apache-2.0
// client CAPTURE: prints the statistics in a capture, a line each.

#include <ksp/statistics.h>
#include <ksp/entries.hpp>

#include <fstream>
#include <iostream>
#include <iterator>
#include <string>

int main(int argc, char** argv) {
  if (argc != 2) return 2;
  std::ifstream file(argv[1], std::ios::binary);
  const std::string stream(std::istreambuf_iterator<char>(file), {});

  ksp::GenericContext context;
  KSPFTLParseBufferToCxt(context.get(), stream.data(), static_cast<uint32_t>(stream.size()));
  for (auto [name, value] : ksp::entries(context)) std::cout << name << " = " << value << '\n';
}
