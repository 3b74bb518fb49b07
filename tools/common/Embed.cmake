# Joins a page and the files that it names into a source with two texts: what precedes the page's
# data, and what follows. Arguments: PAGE, NAME, OUTPUT.
get_filename_component(folder ${PAGE} DIRECTORY)
file(READ ${PAGE} page)

# Puts a named file in place of each element of the page that matches.
function(embed pattern before after)
  string(REGEX MATCHALL "${pattern}" elements "${page}")
  foreach(element IN LISTS elements)
    string(REGEX MATCH "[a-z./]+\\.(css|js)" name "${element}")
    file(READ ${folder}/${name} text)
    string(REPLACE "${element}" "${before}\n${text}${after}" page "${page}")
  endforeach()
  set(page "${page}" PARENT_SCOPE)
endfunction()

embed("<link rel=\"stylesheet\" href=\"[a-z./]+\\.css\">" "<style>" "</style>")
embed("<script src=\"[a-z./]+\\.js\"></script>" "<script>" "</script>")

# What stands there lets the page's files be opened as they are.
if(NOT page MATCHES "(<script type=\"application/json\" id=\"data\">)([^<]*)<")
  message(FATAL_ERROR "${PAGE} has no place for its data")
endif()
string(LENGTH "${CMAKE_MATCH_1}" before)
string(LENGTH "${CMAKE_MATCH_2}" length)
string(FIND "${page}" "${CMAKE_MATCH_1}" begin)
math(EXPR begin "${begin} + ${before}")
math(EXPR end "${begin} + ${length}")
string(SUBSTRING "${page}" 0 ${begin} start)
string(SUBSTRING "${page}" ${end} -1 rest)

file(WRITE ${OUTPUT} "// Made from ${PAGE}.
#include \"common/Page.h\"

namespace VOK::MemPool::Tools {

extern const Page ${NAME}Page;
const Page ${NAME}Page = {R\"page(${start})page\", R\"page(${rest})page\"};

} // namespace VOK::MemPool::Tools
")
