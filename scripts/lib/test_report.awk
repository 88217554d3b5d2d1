# Summarises a run of ctest, from its output and from its LastTest.log:
#
#   awk -v part=failures -f test_report.awk PRINTED LastTest.log     each failed test with its output
#   awk -v part=skips -f test_report.awk PRINTED LastTest.log        REASON<tab>NAME for each skipped test
#   awk -v part=counts -f test_report.awk PRINTED LastTest.log       PASSED FAILED SKIPPED, and ctest's number of tests
#
# A test of ctest is a program: one case of GoogleTest, many cases, or a script. Of many cases, the failed and skipped
# ones are listed, and all are counted. LastTest.log alone is not enough: in it, skipped tests have passed. If a test
# was tried more than once, the last try counts.

function tell(  i) {
  printf "\n-- %s (%s)\n", name, result[name]
  if (count == 0) print "   (it said nothing)"
  for (i = 1; i <= count && i <= 100; i++) print said[i]
  if (count > 100) printf "   ... and %d lines more in %s\n", count - 100, FILENAME
}

function skip(who, why) {
  if (part == "skips") printf "%s\t%s\n", why == "" ? "no reason given" : why, who
}

# Counts the results of the cases of the program that has just ended.
function tally() {
  if (!totals) {
    passed_of[name] = failed_of[name] = skipped_of[name] = 0
    if (result[name] == "Skipped") skipped_of[name] = 1
    else if (result[name] == "") passed_of[name] = 1
    else failed_of[name] = 1
    return
  }
  passed_of[name] = passed
  skipped_of[name] = skipped
  # For example, the program crashed after its last case.
  failed_of[name] = failed == 0 && result[name] != "" && result[name] != "Skipped" ? 1 : failed
}

FNR == NR {
  if (match($0, /Test +#[0-9]+: [^ ]+ .*\*\*\*/)) {
    how = substr($0, RSTART + RLENGTH); sub(/  +[0-9.]+ sec.*/, "", how)
    who = $0; sub(/^.*Test +#[0-9]+: /, "", who); sub(/ .*/, "", who)
    result[who] = how
  } else if (match($0, /Test +#[0-9]+: [^ ]+ .* Passed /)) {
    who = $0; sub(/^.*Test +#[0-9]+: /, "", who); sub(/ .*/, "", who)
    delete result[who]
  }
  next
}
/^[0-9]+\/[0-9]+ Testing: / {
  name = $3; count = 0; cases = 0; start = 0; last = ""; reason = ""; in_reason = 0
  totals = 0; passed = 0; failed = 0; skipped = 0
  next
}
/^Output:$/ { getline; inside = 1; next }
/^<end of output>$/ {
  inside = 0
  if (result[name] == "Skipped" && !cases) { sub(/^SKIPPED: /, "", last); skip(name, last) }
  if (part == "failures" && name in result && result[name] != "" && result[name] != "Skipped") tell()
  tally()
  next
}
inside {
  if ($0 ~ /^\[==========\] [0-9]+ tests? from .* ran\./) totals = 1
  if (totals && $0 ~ /^\[  PASSED  \] [0-9]+ tests?\.$/) passed = $4
  if (totals && $0 ~ /^\[  SKIPPED \] [0-9]+ tests?, listed below:$/) skipped = $4
  if (totals && $0 ~ /^\[  FAILED  \] [0-9]+ tests?, listed below:$/) failed = $4
  if ($0 ~ /^\[ RUN      \] /) start = count
  said[++count] = $0
  # A case that passed or was skipped is not the cause of its program's failure.
  if ($0 ~ /^\[       OK \] /) count = start
  if ($0 ~ /^\[  SKIPPED \] [^ ]+ \(/) { skip($4, reason); cases++; reason = ""; count = start }
  if (in_reason && $0 == "") in_reason = 0
  if (in_reason) reason = reason (reason == "" ? "" : " ") $0
  if ($0 ~ /^[^ ]+:[0-9]+: Skipped$/) { in_reason = 1; reason = "" }
  if ($0 != "") last = $0
}
END {
  if (part == "counts") {
    for (name in passed_of) { p += passed_of[name]; f += failed_of[name]; s += skipped_of[name]; tests++ }
    print p + 0, f + 0, s + 0, tests + 0
  }
}
