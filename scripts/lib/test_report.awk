# What a run of ctest has to tell, from what it printed and from the LastTest.log that it left:
#
#   awk -v part=failures -f test_report.awk PRINTED LastTest.log     each failed test with what it said
#   awk -v part=skips -f test_report.awk PRINTED LastTest.log        REASON<tab>NAME for each test that was left out
#
# A test of ctest is a program: one case of GoogleTest, many of them, or a script. Of many cases, those are told that
# failed or were left out. LastTest.log alone does not tell: it has skipped tests for passed.

function tell(  i) {
  printf "\n-- %s (%s)\n", name, result[name]
  if (count == 0) print "   (it said nothing)"
  for (i = 1; i <= count && i <= 100; i++) print said[i]
  if (count > 100) printf "   ... and %d lines more in %s\n", count - 100, FILENAME
}

function skip(who, why) {
  if (part == "skips") printf "%s\t%s\n", why == "" ? "no reason given" : why, who
}

FNR == NR {
  if (match($0, /Test +#[0-9]+: [^ ]+ .*\*\*\*/)) {
    how = substr($0, RSTART + RLENGTH); sub(/  +[0-9.]+ sec.*/, "", how)
    who = $0; sub(/^.*Test +#[0-9]+: /, "", who); sub(/ .*/, "", who)
    result[who] = how
  }
  next
}
/^[0-9]+\/[0-9]+ Testing: / {
  name = $3; count = 0; cases = 0; start = 0; last = ""; reason = ""; in_reason = 0
  next
}
/^Output:$/ { getline; inside = 1; next }
/^<end of output>$/ {
  inside = 0
  if (result[name] == "Skipped" && !cases) { sub(/^SKIPPED: /, "", last); skip(name, last) }
  if (part == "failures" && name in result && result[name] != "" && result[name] != "Skipped") tell()
  next
}
inside {
  if ($0 ~ /^\[ RUN      \] /) start = count
  said[++count] = $0
  # A case that went well, or was left out, is not what made its program fail.
  if ($0 ~ /^\[       OK \] /) count = start
  if ($0 ~ /^\[  SKIPPED \] [^ ]+ \(/) { skip($4, reason); cases++; reason = ""; count = start }
  if (in_reason && $0 == "") in_reason = 0
  if (in_reason) reason = reason (reason == "" ? "" : " ") $0
  if ($0 ~ /^[^ ]+:[0-9]+: Skipped$/) { in_reason = 1; reason = "" }
  if ($0 != "") last = $0
}
