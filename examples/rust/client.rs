//! A client of VeskIronmoatService, written from the page on frames.

use crate::reader::{require, Broken, Reader, Value};
use crate::types::VERSION;
use std::io::{ErrorKind, Read, Write};
use std::os::unix::{io::OwnedFd, net::UnixStream};
use std::process::{Child, Command, Stdio};
use std::time::{Duration, Instant};

/// The bits of sandbox that a service as it should be has on any kernel.
pub const SANDBOXED: u32 = 0b110_1111_1111;

const KINDS: [&str; 7] =
    ["malformed", "limitExceeded", "typeMismatch", "outOfRange", "keyNotFound", "rejectedByHost",
     "notEnoughMemory"];

#[derive(Debug)]
pub enum Error {
    /// The message is bad and always will be. `path` is in wire keys, `offset` a byte of it.
    Decoding { kind: &'static str, path: String, offset: Option<u64>, message: String },
    /// Nothing is known of the message: the service died, is too slow, lies, or does not serve.
    Service(String),
}

/// What a message can be unpacked as.
pub trait Schema: Value {
    const OUTPUT_TYPE: &'static str;
}

/// Keeps one service process, for one thread: with the thread that starts it the process ends.
pub struct Client {
    program: String,
    deadline: Duration,
    sandboxed: u32,
    service: Option<Service>,
}

impl Client {
    /// `deadline` is for one message; without a bit of `sandboxed` it goes no further.
    pub fn new(program: &str, deadline: Duration, sandboxed: u32) -> Self {
        Client { program: program.to_string(), deadline, sandboxed, service: None }
    }

    /// Tries a second time when the process was an old one: that may have ended for a reason of its
    /// own. Alone with a new one the message is at fault.
    pub fn unpack<R: Schema>(&mut self, message: &[u8]) -> Result<R, Error> {
        loop {
            let (mut service, fresh) = match self.service.take() {
                Some(service) => (service, false),
                None => (self.start().map_err(Error::Service)?, true),
            };
            match service.ask::<R>(message, Instant::now() + self.deadline) {
                Ok(outcome) => {
                    self.service = Some(service);
                    return outcome;
                }
                Err(problem) if fresh => return Err(Error::Service(problem)),
                Err(_) => {}
            }
        }
    }

    fn start(&self) -> Result<Service, Broken> {
        let text = |error: std::io::Error| error.to_string();
        let (socket, theirs) = UnixStream::pair().map_err(text)?;
        let output = theirs.try_clone().map_err(text)?;
        let process = Command::new(&self.program)
            .env_clear()
            .stdin(Stdio::from(OwnedFd::from(theirs)))
            .stdout(Stdio::from(OwnedFd::from(output)))
            .stderr(Stdio::null())
            .spawn()
            .map_err(text)?;
        let mut service = Service { process, socket, last_id: 0, limits: Limits::default() };
        service.greet(self.sandboxed, Instant::now() + self.deadline)?;
        Ok(service)
    }
}

#[derive(Default)]
struct Limits {
    message: u64,
    record: u64,
    delivered: u64,
    reply: u64,
    nesting: u32,
}

/// One process, with at most one request in flight.
struct Service {
    process: Child,
    socket: UnixStream,
    last_id: u64,
    limits: Limits,
}

impl Drop for Service {
    fn drop(&mut self) {
        // It may have ended by itself.
        let _ = self.process.kill();
        let _ = self.process.wait();
    }
}

impl Service {
    fn greet(&mut self, sandboxed: u32, deadline: Instant) -> Result<(), Broken> {
        let body = self.frame(50, deadline)?;
        let mut hello = Reader { rest: &body, memory: 0, delivered: 0, depth: 0 };
        let named = hello.take(8)? == b"IRONMOAT";
        require(named && hello.number(2)? == u64::from(VERSION), "not a service of this version")?;
        let in_force = hello.number(4)? as u32;
        require(in_force & sandboxed == sandboxed, "not sandboxed")?;
        self.limits = Limits {
            message: hello.number(8)?,
            record: hello.number(8)?,
            delivered: hello.number(8)?,
            reply: hello.number(8)?,
            nesting: hello.number(4)? as u32,
        };
        Ok(())
    }

    /// An error says that the service is of no more use. Does not read while it writes: the service
    /// has nothing to say before it has read all of the only request.
    fn ask<R: Schema>(&mut self, message: &[u8], deadline: Instant) -> Result<Result<R, Error>, Broken> {
        // What is too long is rejected as all of it would be.
        let message = &message[..message.len().min(self.limits.message as usize + 1)];
        let name = R::OUTPUT_TYPE;
        self.last_id += 1;
        let mut request = Vec::with_capacity(13 + name.len() + message.len());
        request.extend_from_slice(&((9 + name.len() + message.len()) as u32).to_le_bytes());
        request.extend_from_slice(&self.last_id.to_le_bytes());
        request.push(name.len() as u8);
        request.extend_from_slice(name.as_bytes());
        request.extend_from_slice(message);
        self.send(&request, deadline)?;
        let body = self.frame(9 + self.limits.reply, deadline)?;
        let mut reply = Reader {
            rest: &body,
            memory: self.limits.record,
            delivered: self.limits.delivered,
            depth: self.limits.nesting,
        };
        require(reply.number(8)? == self.last_id, "a reply to what was not asked")?;
        match reply.number(1)? {
            0 => {
                let mut record = R::default();
                record.read(&mut reply)?;
                require(reply.rest.is_empty(), "a record ends before its frame")?;
                Ok(Ok(record))
            }
            1 => Ok(Err(refusal(&mut reply)?)),
            2 | 3 => Ok(Err(Error::Service(reply.frame_text(reply.rest.len())?))),
            _ => Err("an unknown status".to_string()),
        }
    }

    /// The body of the next frame. Memory for it grows with what comes, not with what its length says.
    fn frame(&mut self, most: u64, deadline: Instant) -> Result<Vec<u8>, Broken> {
        let head = self.receive(4, deadline)?;
        let length = u32::from_le_bytes([head[0], head[1], head[2], head[3]]);
        require(u64::from(length) <= most, "a frame is too long")?;
        self.receive(length as usize, deadline)
    }

    fn receive(&mut self, size: usize, deadline: Instant) -> Result<Vec<u8>, Broken> {
        let mut received = Vec::new();
        let mut piece = [0; 1 << 16];
        while received.len() < size {
            let _ = self.socket.set_read_timeout(Some(left(deadline)?));
            let wanted = piece.len().min(size - received.len());
            match self.socket.read(&mut piece[..wanted]) {
                Ok(0) => return Err("the service ended".to_string()),
                Ok(count) => received.extend_from_slice(&piece[..count]),
                Err(error) => passing(error)?,
            }
        }
        Ok(received)
    }

    fn send(&mut self, mut bytes: &[u8], deadline: Instant) -> Result<(), Broken> {
        while !bytes.is_empty() {
            let _ = self.socket.set_write_timeout(Some(left(deadline)?));
            match self.socket.write(bytes) {
                Ok(count) => bytes = &bytes[count..],
                Err(error) => passing(error)?,
            }
        }
        Ok(())
    }
}

/// The time that is left: a timeout of zero would be none.
fn left(deadline: Instant) -> Result<Duration, Broken> {
    let left = deadline.saturating_duration_since(Instant::now());
    require(!left.is_zero(), "no reply in time").map(|()| left)
}

fn passing(error: std::io::Error) -> Result<(), Broken> {
    let passes = matches!(error.kind(), ErrorKind::Interrupted | ErrorKind::WouldBlock);
    require(passes, &error.to_string())
}

fn refusal(reply: &mut Reader) -> Result<Error, Broken> {
    let kind = *KINDS.get(reply.number(1)? as usize).ok_or("an unknown kind of rejection")?;
    let offset = Some(reply.number(8)?).filter(|offset| *offset != u64::MAX);
    let length = reply.number(2)? as usize;
    let path = reply.frame_text(length)?;
    Ok(Error::Decoding { kind, path, offset, message: reply.frame_text(reply.rest.len())? })
}
