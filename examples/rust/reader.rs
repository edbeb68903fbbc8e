//! Takes a reply apart, every byte of which may be a lie.

/// The rule that a reply breaks.
pub type Broken = String;

pub struct Reader<'a> {
    pub rest: &'a [u8],
    /// What lists, and texts and data, may still take.
    pub memory: u64,
    pub delivered: u64,
    /// Records that may still be inside one another.
    pub depth: u32,
}

/// What a field or an element of a list can be. Read in place, so that records inside one another
/// take little stack.
pub trait Value: Default {
    /// Memory that an element of a list counts with.
    const BYTES: u64 = 16;
    fn read(&mut self, from: &mut Reader) -> Result<(), Broken>;
}

#[derive(Debug, Default)]
pub struct Data(pub Vec<u8>);

pub fn require(condition: bool, problem: &str) -> Result<(), Broken> {
    if condition { Ok(()) } else { Err(problem.to_string()) }
}

impl<'a> Reader<'a> {
    pub fn take(&mut self, size: usize) -> Result<&'a [u8], Broken> {
        require(size <= self.rest.len(), "a frame ends early")?;
        let (taken, rest) = self.rest.split_at(size);
        self.rest = rest;
        Ok(taken)
    }

    pub fn number(&mut self, size: usize) -> Result<u64, Broken> {
        let mut bytes = [0; 8];
        bytes[..size].copy_from_slice(self.take(size)?);
        Ok(u64::from_le_bytes(bytes))
    }

    /// A path or a sentence.
    pub fn frame_text(&mut self, size: usize) -> Result<String, Broken> {
        let text = text(self.take(size)?)?;
        require(size <= 65535 && !text.contains('\0'), "not a valid text")?;
        Ok(text)
    }

    fn delivered(&mut self) -> Result<&'a [u8], Broken> {
        let size = self.number(4)?;
        require(size <= self.delivered, "too much text and data")?;
        self.delivered -= size;
        self.take(size as usize)
    }

    /// Begins a record, which `leave` ends.
    pub fn presence(&mut self, fields: usize) -> Result<&'a [u8], Broken> {
        require(self.depth > 0, "records are nested too deep")?;
        self.depth -= 1;
        let present = self.take((fields + 7) / 8)?;
        let unused = if fields % 8 == 0 { 0 } else { present[fields / 8] >> (fields % 8) };
        require(unused == 0, "a presence bit without a field")?;
        Ok(present)
    }

    pub fn leave(&mut self) -> Result<(), Broken> {
        self.depth += 1;
        Ok(())
    }

    pub fn required<T: Value>(&mut self, present: &[u8], place: usize, to: &mut T) -> Result<(), Broken> {
        require(has(present, place), "a required field is missing")?;
        to.read(self)
    }

    pub fn optional<T: Value>(&mut self, present: &[u8], place: usize, to: &mut Option<T>) -> Result<(), Broken> {
        if has(present, place) { to.insert(T::default()).read(self) } else { Ok(()) }
    }
}

fn has(present: &[u8], place: usize) -> bool {
    present[place / 8] >> (place % 8) & 1 == 1
}

fn text(bytes: &[u8]) -> Result<String, Broken> {
    String::from_utf8(bytes.to_vec()).map_err(|_| "a text is not UTF-8".to_string())
}

impl Value for i64 {
    fn read(&mut self, from: &mut Reader) -> Result<(), Broken> {
        *self = from.number(8)? as i64;
        Ok(())
    }
}

impl Value for bool {
    fn read(&mut self, from: &mut Reader) -> Result<(), Broken> {
        let value = from.number(1)?;
        *self = value == 1;
        require(value <= 1, "a Bool is neither 0 nor 1")
    }
}

impl Value for String {
    fn read(&mut self, from: &mut Reader) -> Result<(), Broken> {
        *self = text(from.delivered()?)?;
        Ok(())
    }
}

impl Value for Data {
    fn read(&mut self, from: &mut Reader) -> Result<(), Broken> {
        self.0 = from.delivered()?.to_vec();
        Ok(())
    }
}

impl<T: Value> Value for Vec<T> {
    fn read(&mut self, from: &mut Reader) -> Result<(), Broken> {
        let count = from.number(4)?;
        // An element takes a byte at least, so that what is here bounds the work ahead.
        let fits = count <= from.rest.len() as u64 && count * T::BYTES <= from.memory;
        require(fits, "a list is too long")?;
        from.memory -= count * T::BYTES;
        self.resize_with(count as usize, T::default);
        self.iter_mut().try_for_each(|element| element.read(from))
    }
}
