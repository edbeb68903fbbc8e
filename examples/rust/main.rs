//! unpack SERVICE [SANDBOXED]: reads lines "OUTPUT_TYPE FILE" and prints a line of JSON for each:
//! {"record": ...}, {"error": ...} or {"failure": ...}. SANDBOXED: the bits to insist on.

mod client;
mod json;
mod reader;
/// Generated: generate_types.py rust records.json > types.rs
mod types {
    use crate::client::Schema;
    use crate::json::{Json, Object};
    use crate::reader::{Broken, Data, Reader, Value};
    include!(concat!(env!("IRONMOAT_TYPES"), "/types.rs"));
}

use client::{Client, Error, Schema, SANDBOXED};
use json::{Json, Object};
use std::io::BufRead;

fn line<R: Schema + Json>(outcome: Result<R, Error>) -> String {
    let mut line = String::new();
    match outcome {
        Ok(record) => {
            let mut out = Object::new(&mut line);
            out.field("record", Some(&record));
            out.end();
        }
        Err(Error::Decoding { kind, path, offset, message }) => {
            line.push_str("{\"error\":");
            let mut out = Object::new(&mut line);
            out.field("kind", Some(&kind.to_string()));
            out.field("path", Some(&path));
            out.field("offset", offset.map(|offset| offset as i64).as_ref());
            out.field("message", Some(&message));
            out.end();
            line.push('}');
        }
        Err(Error::Service(problem)) => {
            let mut out = Object::new(&mut line);
            out.field("failure", Some(&problem));
            out.end();
        }
    }
    line
}

fn main() {
    let arguments: Vec<String> = std::env::args().collect();
    let sandboxed = arguments.get(2).map_or(SANDBOXED, |bits| bits.parse().expect("a number"));
    let deadline = std::time::Duration::from_secs(2);
    let mut client = Client::new(&arguments[1], deadline, sandboxed);
    for request in std::io::stdin().lock().lines() {
        let request = request.expect("a line of text");
        let (output_type, file) = request.split_once(' ').expect("a type and a file");
        let message = std::fs::read(file).expect("a file to read");
        println!("{}", match output_type {
            "DrelUserPayload" => line(client.unpack::<types::DrelUserPayload>(&message)),
            "VeskCommandResponse" => line(client.unpack::<types::VeskCommandResponse>(&message)),
            _ => line(client.unpack::<types::VeskCommandWebTunnelResponse>(&message)),
        });
    }
}
