# styles graph and styles report through CTest, on names that need escaping
# in DOT and inside the page's script. Included after StylesCommandTests.cmake,
# whose styles_command_test it uses; the pages themselves are opened in a
# browser by tests/browser.
styles_command_test(Graph 0 graph ${STYLES_CLI_FILES}/names.json
  SAME_AS ${STYLES_CLI_FILES}/names.dot)
styles_command_test(ReportEscapesScript 0 report ${STYLES_CLI_FILES}/names.json
  OUTPUT "\"name\":\"\\\\u003c/script>\\\\u003cb>\",\"category\":2,\"parent\":3")
styles_command_test(ReportAgainstBroken 4 report ${STYLES_SAMPLE} --against
  ${STYLES_CLI_FILES}/broken.json ERROR "broken.json:1:57: error: .*\\[missing-parent\\]")
styles_command_test(ReportUnwritable 3 report ${STYLES_SAMPLE} -o ${STYLES_CLI_FILES}/absent/page.html
  ERROR "page.html: cannot be written: No such file")
