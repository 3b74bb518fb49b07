# Makes of a document what Doxygen reads, by sed -z -E. It knows a page, and neither the headings in
# it nor a file that is none: a link to those becomes its text.
s/\.md#[^)]*\)/.md)/g
s/\]\((https?:[^)]*|(docs\/)?[a-z-]+\.(md|svg|png))\)/](@\1)/g
s/\[([^]]+)\]\([^@)][^)]*\)/\1/g
s/\]\(@/](/g
# It takes a quotation mark for the end of a piece of code.
s/([^`])`([^`'\n]*'[^`\n]*)`/\1``\2``/g
