// unpack SERVICE [SANDBOXED]: reads lines "OUTPUT_TYPE FILE" and prints a line of JSON for each:
// {"record": ...}, {"error": ...} or {"failure": ...}. SANDBOXED: the bits to insist on.
package main

import (
	"bufio"
	"encoding/json"
	"errors"
	"fmt"
	"os"
	"strconv"
	"strings"
	"time"

	"ironmoat.invalid/ironmoat"
)

func outcome(record any, err error) map[string]any {
	var bad *ironmoat.DecodingError
	if errors.As(err, &bad) {
		return map[string]any{"error": bad}
	} else if err != nil {
		return map[string]any{"failure": err.Error()}
	}
	return map[string]any{"record": record}
}

func unpack(client *ironmoat.Client, outputType string, message []byte) map[string]any {
	switch outputType {
	case "DrelUserPayload":
		return outcome(ironmoat.Unpack[ironmoat.DrelUserPayload](client, message))
	case "VeskCommandResponse":
		return outcome(ironmoat.Unpack[ironmoat.VeskCommandResponse](client, message))
	default:
		return outcome(ironmoat.Unpack[ironmoat.VeskCommandWebTunnelResponse](client, message))
	}
}

func main() {
	client := &ironmoat.Client{
		Program: os.Args[1], Deadline: 2 * time.Second, Sandboxed: ironmoat.Sandboxed}
	defer client.Close()
	if len(os.Args) > 2 {
		bits, _ := strconv.ParseUint(os.Args[2], 0, 32)
		client.Sandboxed = uint32(bits)
	}
	for lines := bufio.NewScanner(os.Stdin); lines.Scan(); {
		outputType, file, _ := strings.Cut(lines.Text(), " ")
		message, err := os.ReadFile(file)
		if err != nil {
			fmt.Fprintln(os.Stderr, err)
			os.Exit(1)
		}
		line, _ := json.Marshal(unpack(client, outputType, message))
		fmt.Println(string(line))
	}
}
