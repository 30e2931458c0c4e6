// SPDX-License-Identifier: Apache-2.0
/* Decodes a statistics capture and looks the controller up, as a client in C. */

/* As libraries for translated texts do. */
#define printf client_printf
#include <ksp/ksp.h>
#undef printf
#include <ksp/platform/driver_service.h>
#include <stdio.h>

int main(int argc, char** argv) {
  static unsigned char stream[1 << 16];
  FILE* file = argc > 1 ? fopen(argv[1], "rb") : NULL;
  if (file == NULL) return 1;
  const uint32_t length = (uint32_t)fread(stream, 1, sizeof stream, file);
  fclose(file);

  ExporterEntry* entry = NULL;
  const uint32_t service = findNandExporter(&entry);
  if (service == 0 || ReleaseServiceObject(service) != 0) return 2;

  GenericParserContext context = {0};
  const uint32_t total = entry->parseFtlBuffer(&context, stream, length);
  printf("%u values, first %s = %s, %s\n", total, context.nameHead->text, context.valueHead->text,
         GetAPIErrorMessage());
  entry->releaseGenericContext(&context);
  return 0;
}
