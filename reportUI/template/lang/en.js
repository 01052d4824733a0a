var vornText = {
  lang: 'en',
  title: 'Storage report',
  csv: 'CSV file',
  noRows: 'No rows',
  damaged: 'The data of this report is damaged. The run’s log says why.',
  missing: 'The data of this report is missing. The run’s log says why.',
  unclear: 'No rows, or the data of this report is missing. The CSV file and the run’s log tell.',
  unknown: 'This page cannot show the report. Its rows stand in the CSV file.',
  firstRows: 'The first {n} rows; the CSV file holds more.',
  bytes: '{n} bytes',
  reports: {
    share_list: 'Shares',
    large_file: 'Largest files'
  },
  columns: {
    share: 'Share',
    volume: 'Volume',
    file: 'File',
    size: 'Size'
  }
};
