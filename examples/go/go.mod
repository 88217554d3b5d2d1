module pinwell.example/judge

go 1.19
