//! Records as the test vectors show them.

use crate::reader::Data;

pub trait Json {
    fn json(&self, out: &mut String);
}

impl Json for i64 {
    fn json(&self, out: &mut String) {
        out.push_str(&self.to_string());
    }
}

impl Json for bool {
    fn json(&self, out: &mut String) {
        out.push_str(if *self { "true" } else { "false" });
    }
}

impl Json for String {
    fn json(&self, out: &mut String) {
        out.push('"');
        for c in self.chars() {
            match c {
                '"' | '\\' => out.extend(['\\', c]),
                c if c < ' ' => out.push_str(&format!("\\u{:04x}", c as u32)),
                c => out.push(c),
            }
        }
        out.push('"');
    }
}

impl Json for Data {
    fn json(&self, out: &mut String) {
        const DIGITS: &[u8] = b"ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
        out.push('"');
        for three in self.0.chunks(3) {
            let bits = (0..3).fold(0, |bits, i| bits << 8 | usize::from(*three.get(i).unwrap_or(&0)));
            for i in 0..4 {
                out.push(if i > three.len() { '=' } else { DIGITS[bits >> (18 - 6 * i) & 63] as char });
            }
        }
        out.push('"');
    }
}

impl<T: Json> Json for Vec<T> {
    fn json(&self, out: &mut String) {
        out.push('[');
        for (place, element) in self.iter().enumerate() {
            out.push_str(if place > 0 { "," } else { "" });
            element.json(out);
        }
        out.push(']');
    }
}

/// A record in JSON, field by field.
pub struct Object<'a>(&'a mut String, char);

impl<'a> Object<'a> {
    pub fn new(out: &'a mut String) -> Self {
        Object(out, '{')
    }
    pub fn field<T: Json>(&mut self, name: &str, value: Option<&T>) {
        if let Some(value) = value {
            self.0.push_str(&format!("{}\"{}\":", self.1, name));
            self.1 = ',';
            value.json(self.0);
        }
    }
    pub fn end(self) {
        self.0.push_str(if self.1 == '{' { "{}" } else { "}" });
    }
}
