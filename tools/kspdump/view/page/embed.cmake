# SPDX-License-Identifier: Apache-2.0
# Writes OUTPUT: a C++ source with the page's files (in FOLDER), the chart library's script (CHARTS) and its
# style (CHARTS_STYLE) as `page.h` declares them.

# The hash as content security policies have it.
function(hash variable text)
  string(SHA256 digest "${text}")
  string(TOUPPER "${digest}" digest)
  file(WRITE "${OUTPUT}.digest" "${digest}")
  execute_process(COMMAND basenc --base16 --decode "${OUTPUT}.digest" COMMAND base64 --wrap=0
                  OUTPUT_VARIABLE encoded COMMAND_ERROR_IS_FATAL ANY)
  file(REMOVE "${OUTPUT}.digest")
  set(${variable} "'sha256-${encoded}'" PARENT_SCOPE)
endfunction()

set(source "#include \"tools/kspdump/view/page/page.h\"\n\nnamespace kspdump {\n")
function(embed name text)
  hash(digest "${text}")
  string(APPEND source "\nconst Embedded ${name} = {R\"KSP(${text})KSP\", \"${digest}\"};\n")
  set(source "${source}" PARENT_SCOPE)
endfunction()

file(READ "${FOLDER}/page.html" page)
embed(kPageHtml "${page}")
file(READ "${CHARTS_STYLE}" charts_style)
file(READ "${FOLDER}/page.css" style)
# The map behind a style or script is for those who work on it, and would be looked for beside the page.
set(map "/[/*]# sourceMappingURL=[^\n]*")
string(REGEX REPLACE "${map}" "" charts_style "${charts_style}")
embed(kPageStyle "${charts_style}\n${style}")
file(READ "${FOLDER}/page.js" script)
embed(kPageScript "${script}")
file(READ "${CHARTS}" charts)
string(REGEX REPLACE "${map}" "" charts "${charts}")
embed(kChartScript "${charts}")
string(APPEND source "\n}  // namespace kspdump\n")
file(WRITE "${OUTPUT}" "${source}")
