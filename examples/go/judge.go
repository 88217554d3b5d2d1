// judge PLATFORM PATH...: prints libpinwell-ticket's results for each artefact, one JSON object a line.
//
// Ends with 0 if all artefacts are unchanged since signing and have a good ticket, with 65 if not.
//
//	go build
package main

import (
	"encoding/json"
	"errors"
	"fmt"
	"os"

	"pinwell.example/judge/pinwell"
)

type verdict struct {
	Verdict    string `json:"verdict"`
	ExitStatus int    `json:"exitStatus"`
	Reason     string `json:"reason"`
}

type verified struct {
	verdict
	Failed [][2]string `json:"failed"`
}

type ticket struct {
	Status int     `json:"status"`
	File   *string `json:"file,omitempty"`
	Offset *uint64 `json:"offset,omitempty"`
	Length *int    `json:"length,omitempty"`
}

type line struct {
	Path       string   `json:"path"`
	Kind       string   `json:"kind"`
	RecordName string   `json:"recordName"`
	Judge      verdict  `json:"judge"`
	Verify     verified `json:"verify"`
	Ticket     ticket   `json:"ticket"`
}

func verdictOf(r *pinwell.Result) verdict { return verdict{r.Verdict, r.ExitStatus, r.Reason} }

func ticketOf(path string) (ticket, error) {
	found, err := pinwell.FindTicket(path)
	var refused *pinwell.Error
	if errors.As(err, &refused) {
		return ticket{Status: refused.Status}, nil
	}
	if err != nil {
		return ticket{}, err
	}
	length := len(found.Data)
	return ticket{0, &found.File, &found.Offset, &length}, nil
}

func show(path string, roots *pinwell.Roots) (bool, error) {
	judged, err := pinwell.Judge(path, roots)
	if err != nil {
		return false, err
	}
	whole, err := pinwell.Verify(path, roots)
	if err != nil {
		return false, err
	}
	found, err := ticketOf(path)
	if err != nil {
		return false, err
	}
	failed := [][2]string{}
	for _, check := range whole.Checks {
		if check.IsFault() {
			failed = append(failed, [2]string{check.Name, check.Place})
		}
	}
	out, err := json.Marshal(line{path, judged.Kind, judged.RecordName, verdictOf(judged),
		verified{verdictOf(whole), failed}, found})
	if err != nil {
		return false, err
	}
	fmt.Println(string(out))
	return whole.IsGood(), nil
}

func fail(err error) {
	fmt.Fprintln(os.Stderr, "judge:", err)
	os.Exit(70)
}

func main() {
	if len(os.Args) < 3 {
		fmt.Fprintln(os.Stderr, "usage: judge PLATFORM PATH...")
		os.Exit(64)
	}
	roots, err := pinwell.RootsFromDirectory(os.Args[1])
	if err != nil {
		fail(err)
	}
	defer roots.Close()
	status := 0
	for _, path := range os.Args[2:] {
		good, err := show(path, roots)
		if err != nil {
			fail(err)
		}
		if !good {
			status = 65
		}
	}
	os.Exit(status)
}
