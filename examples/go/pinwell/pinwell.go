// Package pinwell judges software with a Pinwell ticket, and checks its bytes against its signature.
//
// It calls libpinwell-ticket, which pkg-config must find. All functions may be called from several goroutines at once.
package pinwell

/*
#cgo pkg-config: pinwell-ticket
#include <pinwell/ticket_c.h>
#include <stdlib.h>
*/
import "C"

import (
	"fmt"
	"runtime"
	"unsafe"
)

// Error is the reason of a failed call. A fault of an artefact is not an error of Judge and Verify, but their verdict.
type Error struct {
	Status  int
	Offset  uint64
	Message string
}

func (e *Error) Error() string { return "pinwell: " + e.Message }

// Roots are the certificates at which a ticket's chain may end.
type Roots struct{ handle *C.pinwell_roots }

// Check is one check of an artefact.
type Check struct {
	Name, Place, Outcome, Expected, Found string
	Depth                                 int
}

// IsFault reports whether the check counts as failed.
func (c Check) IsFault() bool {
	return c.Outcome != "passed" && c.Outcome != "skipped" && c.Outcome != "noted"
}

// Result is a verdict, its reason, and all checks. Texts from an artefact need not be UTF-8.
type Result struct {
	Kind, Verdict, Reason, RecordName string
	ExitStatus                        int
	Checks                            []Check
}

// IsGood reports whether the verdict is good.
func (r *Result) IsGood() bool { return r.Verdict == "good" }

// Ticket is a found ticket, and its place.
type Ticket struct {
	Data   []byte
	File   string
	Offset uint64
}

func newError() C.pinwell_error {
	var e C.pinwell_error
	e.struct_size = C.size_t(unsafe.Sizeof(e))
	return e
}

func check(status C.pinwell_status, e *C.pinwell_error) error {
	if status == C.PINWELL_OK {
		return nil
	}
	return &Error{int(status), uint64(e.offset), C.GoString(&e.message[0])}
}

// A path is passed with its length, so that a zero byte in it is detected.
func withPath(path string, call func(*C.char, C.size_t) C.pinwell_status) C.pinwell_status {
	bytes := C.CBytes(append([]byte(path), 0))
	defer C.free(bytes)
	return call((*C.char)(bytes), C.size_t(len(path)))
}

func text(pointer *C.char, length C.size_t) string { return C.GoStringN(pointer, C.int(length)) }

// RootsFromDirectory reads a platform directory, such as /etc/pinwell/platform.
func RootsFromDirectory(path string) (*Roots, error) {
	var handle *C.pinwell_roots
	e := newError()
	status := withPath(path, func(p *C.char, n C.size_t) C.pinwell_status {
		return C.pinwell_roots_from_directory(p, n, &handle, &e)
	})
	if err := check(status, &e); err != nil {
		return nil, err
	}
	roots := &Roots{handle}
	runtime.SetFinalizer(roots, (*Roots).Close)
	return roots, nil
}

// Count returns the number of certificates.
func (r *Roots) Count() int {
	defer runtime.KeepAlive(r)
	return int(C.pinwell_roots_count(r.handle))
}

// Close frees the certificates. It may be called again.
func (r *Roots) Close() {
	C.pinwell_roots_free(r.handle)
	r.handle = nil
}

// Judge judges the attached ticket of an artefact, without checking its bytes.
func Judge(path string, roots *Roots) (*Result, error) {
	defer runtime.KeepAlive(roots)
	var handle *C.pinwell_result
	e := newError()
	status := withPath(path, func(p *C.char, n C.size_t) C.pinwell_status {
		return C.pinwell_judge_file(p, n, roots.handle, nil, &handle, &e)
	})
	return result(handle), check(status, &e)
}

// Verify judges the ticket, and checks every byte of the artefact against the signature.
func Verify(path string, roots *Roots) (*Result, error) {
	defer runtime.KeepAlive(roots)
	var handle *C.pinwell_result
	e := newError()
	status := withPath(path, func(p *C.char, n C.size_t) C.pinwell_status {
		return C.pinwell_verify_file(p, n, roots.handle, nil, &handle, &e)
	})
	return result(handle), check(status, &e)
}

func result(handle *C.pinwell_result) *Result {
	if handle == nil {
		return nil
	}
	defer C.pinwell_result_free(handle)
	var length C.size_t
	r := &Result{
		Kind:       C.GoString(C.pinwell_kind_text(C.pinwell_result_kind(handle))),
		Verdict:    C.GoString(C.pinwell_verdict_text(C.pinwell_result_verdict(handle))),
		ExitStatus: int(C.pinwell_result_exit_status(handle)),
	}
	reason := C.pinwell_result_reason(handle, &length)
	r.Reason = text(reason, length)
	name := C.pinwell_result_record_name(handle, &length)
	r.RecordName = text(name, length)
	for i := C.size_t(0); i < C.pinwell_result_check_count(handle); i++ {
		var c C.pinwell_check
		c.struct_size = C.size_t(unsafe.Sizeof(c))
		if C.pinwell_result_check(handle, i, &c) != C.PINWELL_OK {
			panic(fmt.Sprintf("pinwell: no check %d", i))
		}
		r.Checks = append(r.Checks, Check{
			Name:     text(c.name, c.name_length),
			Place:    text(c.place, c.place_length),
			Outcome:  C.GoString(C.pinwell_outcome_text(c.outcome)),
			Expected: text(c.expected, c.expected_length),
			Found:    text(c.found, c.found_length),
			Depth:    int(c.depth),
		})
	}
	return r
}

// FindTicket finds the attached ticket of an artefact, without judging it.
func FindTicket(path string) (*Ticket, error) {
	var handle *C.pinwell_ticket
	e := newError()
	status := withPath(path, func(p *C.char, n C.size_t) C.pinwell_status {
		return C.pinwell_find_ticket(p, n, &handle, &e)
	})
	if err := check(status, &e); err != nil {
		return nil, err
	}
	defer C.pinwell_ticket_free(handle)
	var length C.size_t
	bytes := C.pinwell_ticket_bytes(handle, &length)
	ticket := &Ticket{
		Data:   C.GoBytes(unsafe.Pointer(bytes), C.int(length)),
		Offset: uint64(C.pinwell_ticket_offset(handle)),
	}
	file := C.pinwell_ticket_file(handle, &length)
	ticket.File = text(file, length)
	return ticket, nil
}
