#!/usr/bin/env node
// judge PLATFORM PATH...: prints libpinwell-ticket's results for each artefact, one JSON object a line.
//
// Ends with 0 if all artefacts are unchanged since signing and have a good ticket, with 65 if not.
'use strict';

const pinwell = require('./pinwell.node');

const isFault = (check) => !['passed', 'skipped', 'noted'].includes(check.outcome);

function ticketOf(path) {
  try {
    const { data, file, offset } = pinwell.findTicket(path);
    return { status: 0, file, offset, length: data.length };
  } catch (error) {
    if (error.status === undefined) throw error;
    return { status: error.status };
  }
}

function show(path, roots) {
  const judged = pinwell.judge(path, roots);
  const verified = pinwell.verify(path, roots);
  const verdictOf = ({ verdict, exitStatus, reason }) => ({ verdict, exitStatus, reason });
  const failed = verified.checks.filter(isFault).map(({ name, place }) => [name, place]);
  console.log(JSON.stringify({
    path,
    kind: judged.kind,
    recordName: judged.recordName,
    judge: verdictOf(judged),
    verify: { ...verdictOf(verified), failed },
    ticket: ticketOf(path),
  }));
  return verified.verdict === 'good';
}

function main([platform, ...paths]) {
  if (paths.length === 0) {
    console.error('usage: judge PLATFORM PATH...');
    return 64;
  }
  const roots = pinwell.rootsFromDirectory(platform);
  return paths.map((path) => show(path, roots)).every(Boolean) ? 0 : 65;
}

process.exitCode = main(process.argv.slice(2));
