package ironmoat

import (
	"bytes"
	"encoding/binary"
	"errors"
	"unicode/utf8"
)

// reader takes a reply's body apart, every byte of which may be a lie. After the first broken rule
// it has nothing left, and everything that is read is zero.
type reader struct {
	rest              []byte
	broken            error
	memory, delivered uint64 // what lists, and texts and data, may still take
	depth             uint32 // records that may still be inside one another
}

type readable[T any] interface {
	*T
	read(from *reader)
}

func (r *reader) fail(problem string) {
	if r.broken == nil {
		r.broken = errors.New(problem)
	}
	r.rest = nil
}

func (r *reader) take(size uint64) []byte {
	if size > uint64(len(r.rest)) {
		r.fail("a frame ends early")
		return nil
	}
	taken := r.rest[:size]
	r.rest = r.rest[size:]
	return taken
}

// number reads size bytes, of which a broken reader has none.
func (r *reader) number(size int) uint64 {
	var bytes [8]byte
	copy(bytes[:], r.take(uint64(size)))
	return binary.LittleEndian.Uint64(bytes[:])
}

func (r *reader) integer() int64 { return int64(r.number(8)) }

func (r *reader) boolean() bool {
	value := r.number(1)
	if value > 1 {
		r.fail("a Bool is neither 0 nor 1")
	}
	return value == 1
}

func (r *reader) data() []byte {
	size := r.number(4)
	if size > r.delivered {
		r.fail("too much text and data")
		return nil
	}
	r.delivered -= size
	return append([]byte{}, r.take(size)...)
}

func (r *reader) text() string {
	text := string(r.data())
	if !utf8.ValidString(text) {
		r.fail("a text is not UTF-8")
	}
	return text
}

// frameText is a path or a sentence.
func (r *reader) frameText(size uint64) string {
	text := r.take(size)
	if size > 65535 || bytes.IndexByte(text, 0) >= 0 || !utf8.Valid(text) {
		r.fail("not a valid text")
	}
	return string(text)
}

func (r *reader) presence(fields int) []byte {
	present := r.take(uint64(fields+7) / 8)
	if spare := fields % 8; spare != 0 && len(present) > 0 && present[len(present)-1]>>spare != 0 {
		r.fail("a presence bit without a field")
	}
	return present
}

func has(present []byte, place int) bool {
	return place/8 < len(present) && present[place/8]>>(place%8)&1 == 1
}

func required[T any](r *reader, present []byte, place int, read func(*reader) T) T {
	if !has(present, place) {
		r.fail("a required field is missing")
	}
	return read(r)
}

func optional[T any](r *reader, present []byte, place int, read func(*reader) T) *T {
	if !has(present, place) {
		return nil
	}
	value := read(r)
	return &value
}

func record[T any, P readable[T]](r *reader) T {
	var to T
	if r.depth == 0 {
		r.fail("records are nested too deep")
		return to
	}
	r.depth--
	P(&to).read(r)
	r.depth++
	return to
}

// list reads elements that take memory of so many bytes each.
func list[T any](bytes uint64, read func(*reader) T) func(*reader) []T {
	return func(r *reader) []T {
		count := r.number(4)
		// An element takes a byte at least, so that what is here bounds the work ahead.
		if count > uint64(len(r.rest)) || count*bytes > r.memory {
			r.fail("a list is too long")
			count = 0
		}
		r.memory -= count * bytes
		values := []T{}
		for ; count > 0 && r.broken == nil; count-- {
			values = append(values, read(r))
		}
		return values
	}
}
