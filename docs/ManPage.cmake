# Writes a man page from a program's own --help texts, so that the two never disagree.
#   cmake -DPROGRAM=path -DNAME=sarn -DSUMMARY="..." -DOUT=sarn.1 -P ManPage.cmake
# The page has NAME and DESCRIPTION from `PROGRAM --help`, then one section per command that
# help lists under "Commands:" (indented lower-case words), from `PROGRAM COMMAND --help`, each
# kept as preformatted text.
function(help_text out)
  execute_process(COMMAND ${PROGRAM} ${ARGN} --help OUTPUT_VARIABLE text RESULT_VARIABLE status)
  if(NOT status EQUAL 0)
    message(FATAL_ERROR "${PROGRAM} ${ARGN} --help failed with ${status}")
  endif()
  # roff: a backslash is \e, and a line starting with '.' or ''' would be a request.
  string(REPLACE "\\" "\\e" text "${text}")
  string(REGEX REPLACE "(^|\n)([.'])" "\\1\\\\&\\2" text "${text}")
  set(${out} "${text}" PARENT_SCOPE)
endfunction()

string(TOUPPER "${NAME}" title)
help_text(main)
string(REGEX MATCHALL "\n  [a-z][a-z-]* " commands "${main}")
string(REGEX REPLACE "[\n ]" "" commands "${commands}")
set(page ".TH ${title} 1 \"\" \"${NAME}\" \"User Commands\"\n.SH NAME\n${NAME} \\- ${SUMMARY}\n")
string(APPEND page ".SH DESCRIPTION\n.nf\n${main}.fi\n")
foreach(command IN LISTS commands)
  help_text(text ${command})
  string(TOUPPER "${command}" heading)
  string(APPEND page ".SH ${heading}\n.nf\n${text}.fi\n")
endforeach()
file(WRITE ${OUT} "${page}")
