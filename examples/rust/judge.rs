//! judge PLATFORM PATH...: prints libpinwell-ticket's results for each artefact, one JSON object a line.
//!
//! Ends with 0 if all artefacts are unchanged since signing and have a good ticket, with 65 if not.

use std::env;
use std::ffi::{OsStr, OsString};
use std::os::unix::ffi::OsStrExt;
use std::path::Path;
use std::process::exit;

mod pinwell;

use pinwell::{Error, Roots, Verdict};

/// Bytes as a JSON text. Bytes outside ASCII are shown as Latin-1, because they need not be UTF-8.
fn quoted(text: &OsStr) -> String {
    let mut out = String::from("\"");
    for &byte in text.as_bytes() {
        match byte {
            b'"' | b'\\' => out.extend(['\\', byte.into()]),
            0x20..=0x7e => out.push(byte.into()),
            _ => out += &format!("\\u{byte:04x}"),
        }
    }
    out + "\""
}

fn verdict_members(found: &Verdict) -> String {
    let reason = quoted(OsStr::new(&found.reason));
    format!("\"verdict\": \"{}\", \"exitStatus\": {}, \"reason\": {reason}", found.verdict, found.exit_status)
}

fn ticket(path: &Path) -> String {
    match pinwell::find_ticket(path) {
        Ok(found) => format!(
            "{{\"status\": 0, \"file\": {}, \"offset\": {}, \"length\": {}}}",
            quoted(found.file.as_os_str()),
            found.offset,
            found.data.len()
        ),
        Err(error) => format!("{{\"status\": {}}}", error.status),
    }
}

fn show(path: &Path, roots: &Roots) -> Result<bool, Error> {
    let judged = pinwell::judge(path, roots)?;
    let verified = pinwell::verify(path, roots)?;
    let failed: Vec<String> = verified
        .checks
        .iter()
        .filter(|check| check.is_fault())
        .map(|check| format!("[\"{}\", {}]", check.name, quoted(&check.place)))
        .collect();
    println!(
        "{{\"path\": {}, \"kind\": \"{}\", \"recordName\": \"{}\", \"judge\": {{{}}}, \
         \"verify\": {{{}, \"failed\": [{}]}}, \"ticket\": {}}}",
        quoted(path.as_os_str()),
        judged.kind,
        judged.record_name,
        verdict_members(&judged),
        verdict_members(&verified),
        failed.join(", "),
        ticket(path)
    );
    Ok(verified.is_good())
}

fn run(platform: &Path, paths: &[OsString]) -> Result<bool, Error> {
    let roots = Roots::from_directory(platform)?;
    if roots.count() == 0 {
        eprintln!("judge: there are no roots in {}", platform.display());
    }
    let mut all_good = true;
    for path in paths {
        all_good &= show(Path::new(path), &roots)?;
    }
    Ok(all_good)
}

fn main() {
    let arguments: Vec<_> = env::args_os().collect();
    if arguments.len() < 3 {
        eprintln!("usage: judge PLATFORM PATH...");
        exit(64);
    }
    match run(Path::new(&arguments[1]), &arguments[2..]) {
        Ok(true) => exit(0),
        Ok(false) => exit(65),
        Err(error) => {
            eprintln!("judge: {error}");
            exit(70);
        }
    }
}
