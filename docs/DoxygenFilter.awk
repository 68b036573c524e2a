# Doxygen's input filter for the public headers: their plain contract comments become
# documentation comments, so that the reference is built from what the headers already say.
# A header's opening comment documents the file; a comment line documents what follows it; a
# comment after a declaration ending in ';' or ',' documents that declaration. Doxygen's command
# characters in comment text are escaped, so that "\n", "<T>" or "#1" stay text.
function escape(text) {
  gsub(/\\/, "\\\\\\\\", text)
  gsub(/[@<>&#%$]/, "\\\\&", text)
  return text
}
/^[ \t]*\/\// {
  at = index($0, "//")
  if (NR == 1) print "/// \\file"
  print substr($0, 1, at - 1) "///" escape(substr($0, at + 2))
  next
}
/[;,][ \t]*\/\/ / && !/"/ {
  at = index($0, "// ")
  print substr($0, 1, at - 1) "///< " escape(substr($0, at + 3))
  next
}
{ print }
