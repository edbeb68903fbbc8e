// Package ironmoat is a client of VeskIronmoatService, written from the page on frames; types.go is
// generated (generate_types.py go records.json > types.go).
package ironmoat

import (
	"bytes"
	"encoding/binary"
	"fmt"
	"io"
	"math"
	"net"
	"os"
	"os/exec"
	"syscall"
	"time"
)

// Sandboxed has the bits of sandbox that a service as it should be has on any kernel.
const Sandboxed = 0b110_1111_1111

var kinds = []string{"malformed", "limitExceeded", "typeMismatch", "outOfRange", "keyNotFound",
	"rejectedByHost", "notEnoughMemory"}

// A DecodingError says that the message is bad and always will be.
type DecodingError struct {
	Kind    string  `json:"kind"`
	Path    string  `json:"path"`             // in wire keys
	Offset  *uint64 `json:"offset,omitempty"` // byte of the message
	Message string  `json:"message"`
}

func (e *DecodingError) Error() string { return e.Kind + ": " + e.Message }

// A ServiceError says nothing of the message: the service died, is too slow, lies, or does not serve.
type ServiceError struct {
	Message string `json:"message"`
}

func (e *ServiceError) Error() string { return e.Message }

type schema[T any] interface {
	readable[T]
	outputType() string
}

// Client keeps one service process, which takes one message at a time. Not for several goroutines at
// once: those that are to unpack at the same time need a Client each.
type Client struct {
	Program   string        // path of the service
	Deadline  time.Duration // for one message
	Sandboxed uint32        // bits without which it goes no further
	service   *service
}

// Unpack returns the record, or a *DecodingError or *ServiceError.
func Unpack[T any, P schema[T]](client *Client, message []byte) (*T, error) {
	var to T
	read := func(reply *reader) { to = record[T, P](reply) }
	if err := client.exchange(P(&to).outputType(), message, read); err != nil {
		return nil, err
	}
	return &to, nil
}

// Close ends the process; the next message starts another one.
func (client *Client) Close() {
	if client.service != nil {
		client.service.kill()
	}
	client.service = nil
}

// exchange tries a second time when the process was an old one: that may have ended for a reason of
// its own. Alone with a new one the message is at fault.
func (client *Client) exchange(outputType string, message []byte, read func(*reader)) error {
	var refusal, err error
	for fresh := false; !fresh; {
		if fresh = client.service == nil; fresh {
			client.service, err = start(client.Program, client.Sandboxed, client.Deadline)
			if err != nil {
				break
			}
		}
		client.service.socket.SetDeadline(time.Now().Add(client.Deadline))
		refusal, err = client.service.ask(outputType, message, read)
		if err == nil {
			return refusal
		}
		client.Close()
	}
	return &ServiceError{err.Error()}
}

// service is one process, with at most one request in flight.
type service struct {
	process *exec.Cmd
	socket  net.Conn
	lastID  uint64
	hello   struct {
		Name                                                  [8]byte
		Version                                               uint16
		Sandbox                                               uint32
		MessageBytes, RecordBytes, DeliveredBytes, ReplyBytes uint64
		NestedContainers                                      uint32
	}
}

// start relies on Go's threads: they do not end while the program runs, and with them no service.
func start(program string, sandboxed uint32, deadline time.Duration) (*service, error) {
	pair, err := syscall.Socketpair(syscall.AF_UNIX, syscall.SOCK_STREAM|syscall.SOCK_CLOEXEC, 0)
	if err != nil {
		return nil, err
	}
	ours, theirs := os.NewFile(uintptr(pair[0]), "ours"), os.NewFile(uintptr(pair[1]), "theirs")
	defer ours.Close()
	defer theirs.Close()
	s := &service{process: &exec.Cmd{
		Path: program, Args: []string{program}, Env: []string{}, Stdin: theirs, Stdout: theirs}}
	if s.socket, err = net.FileConn(ours); err != nil {
		return nil, err
	}
	if err = s.process.Start(); err != nil {
		s.socket.Close()
		return nil, err
	}
	theirs.Close() // so that the end of the process is the end of what can be read
	s.socket.SetDeadline(time.Now().Add(deadline))
	if err = s.greet(sandboxed); err != nil {
		s.kill()
		return nil, err
	}
	return s, nil
}

func (s *service) kill() {
	s.process.Process.Kill()
	s.process.Wait()
	s.socket.Close()
}

func (s *service) greet(sandboxed uint32) error {
	body, err := s.frame(50)
	if err != nil {
		return err
	}
	err = binary.Read(bytes.NewReader(body), binary.LittleEndian, &s.hello)
	if err != nil || string(s.hello.Name[:]) != "IRONMOAT" || s.hello.Version != version {
		return fmt.Errorf("not a service of version %d", version)
	}
	if s.hello.Sandbox&sandboxed != sandboxed {
		return fmt.Errorf("not sandboxed: %#x", s.hello.Sandbox)
	}
	return nil
}

// ask sends a request and reads its reply. It does not read while it writes: the service has nothing
// to say before it has read all of the only request. An error says that the service is of no more use.
func (s *service) ask(outputType string, message []byte, read func(*reader)) (refusal, err error) {
	if uint64(len(message)) > s.hello.MessageBytes {
		message = message[:s.hello.MessageBytes+1] // is rejected as all of it would be
	}
	s.lastID++
	head := binary.LittleEndian.AppendUint32(nil, uint32(9+len(outputType)+len(message)))
	head = binary.LittleEndian.AppendUint64(head, s.lastID)
	head = append(append(head, byte(len(outputType))), outputType...)
	if _, err = (&net.Buffers{head, message}).WriteTo(s.socket); err != nil {
		return
	}
	body, err := s.frame(9 + s.hello.ReplyBytes)
	if err != nil {
		return
	}
	reply := &reader{body, nil, s.hello.RecordBytes, s.hello.DeliveredBytes, s.hello.NestedContainers}
	if reply.number(8) != s.lastID {
		reply.fail("a reply to what was not asked")
	}
	switch reply.number(1) {
	case 0:
		read(reply)
	case 1:
		refusal = reply.refusal()
	case 2, 3:
		refusal = &ServiceError{reply.frameText(uint64(len(reply.rest)))}
	default:
		reply.fail("an unknown status")
	}
	if len(reply.rest) > 0 {
		reply.fail("a record ends before its frame")
	}
	return refusal, reply.broken
}

func (r *reader) refusal() error {
	kind, offset := r.number(1), r.number(8)
	refusal := &DecodingError{Path: r.frameText(r.number(2))}
	refusal.Message = r.frameText(uint64(len(r.rest)))
	if kind >= uint64(len(kinds)) {
		r.fail("an unknown kind of rejection")
	} else if refusal.Kind = kinds[kind]; offset != math.MaxUint64 {
		refusal.Offset = &offset
	}
	return refusal
}

// frame returns the body of the next frame. Memory for it grows with what comes, not with what its
// length says.
func (s *service) frame(most uint64) ([]byte, error) {
	var length uint32
	if err := binary.Read(s.socket, binary.LittleEndian, &length); err != nil {
		return nil, err
	}
	if uint64(length) > most {
		return nil, fmt.Errorf("a frame of %d bytes is too long", length)
	}
	var body bytes.Buffer
	_, err := io.CopyN(&body, s.socket, int64(length))
	return body.Bytes(), err
}
