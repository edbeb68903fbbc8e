module ironmoat.invalid/ironmoat

go 1.19
