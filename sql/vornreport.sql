-- History of volume usage: one row per volume and collection.
--
-- All values are texts: sizes in bytes and percentages are decimal numbers, sampleDate is the time
-- of the collection in seconds since the epoch (ten digits until the year 2286, so texts sort as
-- numbers do). All rows of one collection have the same sampleDate.
CREATE TABLE IF NOT EXISTS VolumeUsage (
  profile TEXT NOT NULL,
  volume TEXT NOT NULL,
  sizeUse TEXT NOT NULL,
  sizeFree TEXT NOT NULL,
  percent TEXT NOT NULL,
  sampleDate TEXT NOT NULL
);

-- For a profile's history in order of time.
CREATE INDEX IF NOT EXISTS VolumeUsageHistory ON VolumeUsage (profile, sampleDate);
-- For the rotation, which looks for the oldest collections of all profiles.
CREATE INDEX IF NOT EXISTS VolumeUsageDates ON VolumeUsage (sampleDate);

-- What finished reports counted, for growth: one row per profile and report. `time` is when the run
-- began, in seconds since the epoch, negative until the report is finished, when `valid` becomes 1;
-- `folders` is how many `details` holds. Both texts are lines of fields with tabs between them.
CREATE TABLE IF NOT EXISTS Snapshot (
  profile TEXT NOT NULL,
  time INTEGER NOT NULL,
  valid INTEGER NOT NULL,
  folders INTEGER NOT NULL,
  summary TEXT NOT NULL,
  details TEXT NOT NULL,
  PRIMARY KEY (profile, time)
);
