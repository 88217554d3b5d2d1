//! Judges software with a Pinwell ticket, and checks its bytes against its signature.
//!
//! The declarations below are the same as in <pinwell/ticket_c.h>; the safe functions use them. All functions may be
//! called from several threads at once.

use std::ffi::{CStr, OsStr, OsString};
use std::os::raw::c_char;
use std::os::unix::ffi::{OsStrExt, OsStringExt};
use std::path::{Path, PathBuf};
use std::{fmt, ptr, slice};

#[allow(non_camel_case_types)]
mod sys {
    use std::os::raw::{c_char, c_void};

    #[repr(C)]
    pub struct pinwell_roots {
        opaque: [u8; 0],
    }
    #[repr(C)]
    pub struct pinwell_result {
        opaque: [u8; 0],
    }
    #[repr(C)]
    pub struct pinwell_ticket {
        opaque: [u8; 0],
    }

    #[repr(C)]
    pub struct pinwell_error {
        pub struct_size: usize,
        pub status: i32,
        pub system_error: i32,
        pub offset: u64,
        pub message: [c_char; 512],
    }

    #[repr(C)]
    pub struct pinwell_check {
        pub struct_size: usize,
        pub outcome: i32,
        pub depth: u32,
        pub name: *const c_char,
        pub name_length: usize,
        pub place: *const c_char,
        pub place_length: usize,
        pub expected: *const c_char,
        pub expected_length: usize,
        pub found: *const c_char,
        pub found_length: usize,
    }

    pub type Assess = unsafe extern "C" fn(
        *const c_char,
        usize,
        *const pinwell_roots,
        *const c_void,
        *mut *mut pinwell_result,
        *mut pinwell_error,
    ) -> i32;

    #[link(name = "pinwell-ticket")]
    extern "C" {
        pub fn pinwell_kind_text(kind: i32) -> *const c_char;
        pub fn pinwell_verdict_text(verdict: i32) -> *const c_char;
        pub fn pinwell_outcome_text(outcome: i32) -> *const c_char;
        pub fn pinwell_roots_from_directory(
            path: *const c_char,
            length: usize,
            roots: *mut *mut pinwell_roots,
            error: *mut pinwell_error,
        ) -> i32;
        pub fn pinwell_roots_count(roots: *const pinwell_roots) -> usize;
        pub fn pinwell_roots_free(roots: *mut pinwell_roots) -> i32;
        pub fn pinwell_judge_file(
            path: *const c_char,
            length: usize,
            roots: *const pinwell_roots,
            options: *const c_void,
            result: *mut *mut pinwell_result,
            error: *mut pinwell_error,
        ) -> i32;
        pub fn pinwell_verify_file(
            path: *const c_char,
            length: usize,
            roots: *const pinwell_roots,
            options: *const c_void,
            result: *mut *mut pinwell_result,
            error: *mut pinwell_error,
        ) -> i32;
        pub fn pinwell_result_kind(result: *const pinwell_result) -> i32;
        pub fn pinwell_result_verdict(result: *const pinwell_result) -> i32;
        pub fn pinwell_result_exit_status(result: *const pinwell_result) -> i32;
        pub fn pinwell_result_reason(result: *const pinwell_result, length: *mut usize) -> *const c_char;
        pub fn pinwell_result_record_name(result: *const pinwell_result, length: *mut usize) -> *const c_char;
        pub fn pinwell_result_check_count(result: *const pinwell_result) -> usize;
        pub fn pinwell_result_check(result: *const pinwell_result, index: usize, check: *mut pinwell_check) -> i32;
        pub fn pinwell_result_free(result: *mut pinwell_result) -> i32;
        pub fn pinwell_find_ticket(
            path: *const c_char,
            length: usize,
            ticket: *mut *mut pinwell_ticket,
            error: *mut pinwell_error,
        ) -> i32;
        pub fn pinwell_ticket_bytes(ticket: *const pinwell_ticket, length: *mut usize) -> *const u8;
        pub fn pinwell_ticket_file(ticket: *const pinwell_ticket, length: *mut usize) -> *const c_char;
        pub fn pinwell_ticket_offset(ticket: *const pinwell_ticket) -> u64;
        pub fn pinwell_ticket_free(ticket: *mut pinwell_ticket) -> i32;
    }
}

/// The reason of a failed call. A fault of an artefact is not an error of `judge` and `verify`, but their verdict.
#[derive(Debug)]
pub struct Error {
    pub status: i32,
    pub message: String,
}

impl fmt::Display for Error {
    fn fmt(&self, to: &mut fmt::Formatter<'_>) -> fmt::Result {
        to.write_str(&self.message)
    }
}

impl std::error::Error for Error {}

/// The certificates at which a ticket's chain may end.
pub struct Roots(*mut sys::pinwell_roots);

// The library accepts a handle from any thread.
unsafe impl Send for Roots {}
unsafe impl Sync for Roots {}

/// One check of an artefact. The place need not be UTF-8.
pub struct Check {
    pub name: String,
    pub place: OsString,
    pub outcome: &'static str,
}

impl Check {
    /// Whether the check counts as failed.
    pub fn is_fault(&self) -> bool {
        !matches!(self.outcome, "passed" | "skipped" | "noted")
    }
}

/// A verdict, its reason, and all checks.
pub struct Verdict {
    pub kind: &'static str,
    pub verdict: &'static str,
    pub exit_status: i32,
    pub reason: String,
    pub record_name: String,
    pub checks: Vec<Check>,
}

impl Verdict {
    /// Whether the verdict is good.
    pub fn is_good(&self) -> bool {
        self.verdict == "good"
    }
}

/// A found ticket, and its place.
pub struct Ticket {
    pub data: Vec<u8>,
    pub file: PathBuf,
    pub offset: u64,
}

fn new_error() -> sys::pinwell_error {
    sys::pinwell_error {
        struct_size: std::mem::size_of::<sys::pinwell_error>(),
        status: 0,
        system_error: 0,
        offset: 0,
        message: [0; 512],
    }
}

fn check(status: i32, error: &sys::pinwell_error) -> Result<(), Error> {
    if status == 0 {
        return Ok(());
    }
    // The library ends the message with a zero byte.
    let message = unsafe { CStr::from_ptr(error.message.as_ptr()) };
    Err(Error { status, message: message.to_string_lossy().into_owned() })
}

fn word(text: *const c_char) -> &'static str {
    // In static memory, and ASCII.
    unsafe { CStr::from_ptr(text) }.to_str().unwrap_or("none")
}

/// A copy of a handle's bytes, which are valid only until the handle is freed.
unsafe fn bytes(pointer: *const u8, length: usize) -> Vec<u8> {
    if pointer.is_null() {
        return Vec::new();
    }
    slice::from_raw_parts(pointer, length).to_vec()
}

unsafe fn text(pointer: *const c_char, length: usize) -> OsString {
    OsString::from_vec(bytes(pointer.cast(), length))
}

fn lossy(text: &OsStr) -> String {
    text.to_string_lossy().into_owned()
}

impl Roots {
    /// Reads a platform directory, such as /etc/pinwell/platform.
    pub fn from_directory(path: &Path) -> Result<Roots, Error> {
        let raw = path.as_os_str().as_bytes();
        let (mut handle, mut error) = (ptr::null_mut(), new_error());
        let status =
            unsafe { sys::pinwell_roots_from_directory(raw.as_ptr().cast(), raw.len(), &mut handle, &mut error) };
        check(status, &error)?;
        Ok(Roots(handle))
    }

    /// The number of certificates.
    pub fn count(&self) -> usize {
        unsafe { sys::pinwell_roots_count(self.0) }
    }
}

impl Drop for Roots {
    fn drop(&mut self) {
        unsafe { sys::pinwell_roots_free(self.0) };
    }
}

/// Judges the attached ticket of an artefact, without checking its bytes.
pub fn judge(path: &Path, roots: &Roots) -> Result<Verdict, Error> {
    assess(sys::pinwell_judge_file, path, roots)
}

/// Judges the ticket, and checks every byte of the artefact against the signature.
pub fn verify(path: &Path, roots: &Roots) -> Result<Verdict, Error> {
    assess(sys::pinwell_verify_file, path, roots)
}

fn assess(function: sys::Assess, path: &Path, roots: &Roots) -> Result<Verdict, Error> {
    let raw = path.as_os_str().as_bytes();
    let (mut handle, mut error) = (ptr::null_mut(), new_error());
    unsafe {
        let status = function(raw.as_ptr().cast(), raw.len(), roots.0, ptr::null(), &mut handle, &mut error);
        check(status, &error)?;
        let mut length = 0;
        let reason = sys::pinwell_result_reason(handle, &mut length);
        let reason = lossy(&text(reason, length));
        let record_name = sys::pinwell_result_record_name(handle, &mut length);
        let record_name = lossy(&text(record_name, length));
        let verdict = Verdict {
            kind: word(sys::pinwell_kind_text(sys::pinwell_result_kind(handle))),
            verdict: word(sys::pinwell_verdict_text(sys::pinwell_result_verdict(handle))),
            exit_status: sys::pinwell_result_exit_status(handle),
            reason,
            record_name,
            checks: (0..sys::pinwell_result_check_count(handle)).map(|index| check_at(handle, index)).collect(),
        };
        sys::pinwell_result_free(handle);
        Ok(verdict)
    }
}

unsafe fn check_at(handle: *const sys::pinwell_result, index: usize) -> Check {
    let mut one: sys::pinwell_check = std::mem::zeroed();
    one.struct_size = std::mem::size_of::<sys::pinwell_check>();
    assert_eq!(sys::pinwell_result_check(handle, index, &mut one), 0);
    Check {
        name: lossy(&text(one.name, one.name_length)),
        place: text(one.place, one.place_length),
        outcome: word(sys::pinwell_outcome_text(one.outcome)),
    }
}

/// Finds the ticket that is attached to an artefact. Whether it is genuine is not asked.
pub fn find_ticket(path: &Path) -> Result<Ticket, Error> {
    let raw = path.as_os_str().as_bytes();
    let (mut handle, mut error) = (ptr::null_mut(), new_error());
    unsafe {
        let status = sys::pinwell_find_ticket(raw.as_ptr().cast(), raw.len(), &mut handle, &mut error);
        check(status, &error)?;
        let mut length = 0;
        let data = sys::pinwell_ticket_bytes(handle, &mut length);
        let data = bytes(data, length);
        let file = sys::pinwell_ticket_file(handle, &mut length);
        let file = PathBuf::from(text(file, length));
        let offset = sys::pinwell_ticket_offset(handle);
        sys::pinwell_ticket_free(handle);
        Ok(Ticket { data, file, offset })
    }
}
