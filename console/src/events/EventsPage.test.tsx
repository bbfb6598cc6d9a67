import { render, screen, within } from '@testing-library/react';
import userEvent from '@testing-library/user-event';
import { expect, it } from 'vitest';
import type { LogEvent } from '../api/types';
import { imitate, Refusal } from '../rules/imitated';
import EventsPage from './EventsPage';

const event = (number: number, more: Partial<LogEvent> = {}): LogEvent => ({
  time: 1764230393 - number * 60,
  kind: 2,
  level: 1,
  code: 293602308,
  text: `Event number ${number}.`,
  ...more,
});

function log(total: number) {
  return imitate({
    'events.list': ({ offset = 0, limit = 100 }) => ({
      total,
      events: Array.from({ length: Math.max(0, Math.min(limit, total - offset)) }, (_unused, index) =>
        event(offset + index),
      ),
    }),
  });
}

it('shows time, level, kind, text and code of each event in words', async () => {
  imitate({
    'events.list': () => ({ total: 2, events: [event(0), event(1, { level: 3, kind: 7, code: -1 })] }),
  });
  render(<EventsPage />);
  const [first, second] = within(await screen.findByRole('table'))
    .getAllByRole('row')
    .slice(1);
  expect(first).toHaveTextContent(
    /Nov 2[67], 2025.*Information.*Domain membership.*Event number 0\..*0x11800404/,
  );
  expect(second).toHaveTextContent(/Level 3.*Kind 7.*0xffffffff/);
});

it('asks for one page at a time', async () => {
  const appliance = log(250);
  render(<EventsPage />);
  await screen.findByText('1 to 100 of 250 events');
  const user = userEvent.setup();
  await user.click(screen.getAllByRole('button', { name: 'Last page' })[0] as HTMLElement);
  await screen.findByText('201 to 250 of 250 events');
  expect(screen.getByText('Event number 249.')).toBeInTheDocument();
  expect(appliance.of('events.list').map((call) => call.parameters)).toEqual([
    { offset: 0, limit: 100 },
    { offset: 200, limit: 100 },
  ]);
});

it('goes back to the last page when the log has become shorter', async () => {
  const appliance = log(250);
  render(<EventsPage />);
  await screen.findByText('1 to 100 of 250 events');
  appliance.handlers['events.list'] = ({ offset = 0 }) =>
    offset === 0 ? { total: 3, events: [event(0), event(1), event(2)] } : { total: 3, events: [] };
  await userEvent.click(screen.getAllByRole('button', { name: 'Next page' })[0] as HTMLElement);
  await screen.findByText('1 to 3 of 3 events');
});

it('is not empty-handed when there are none', async () => {
  log(0);
  render(<EventsPage />);
  expect(await screen.findByRole('heading', { name: 'No events yet' })).toBeInTheDocument();
});

it('keeps what was there when a reload fails', async () => {
  const appliance = log(3);
  render(<EventsPage />);
  await screen.findByText('1 to 3 of 3 events');
  appliance.handlers['events.list'] = () => new Refusal(2617);
  await userEvent.click(screen.getByRole('button', { name: 'Reload' }));
  expect(await screen.findByText('Code 2617')).toBeInTheDocument();
  expect(screen.getByText('Event number 2.')).toBeInTheDocument();
});
