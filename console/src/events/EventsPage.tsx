import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import { EmptyState, EmptyStateBody } from '@patternfly/react-core/dist/esm/components/EmptyState';
import { Label } from '@patternfly/react-core/dist/esm/components/Label';
import ListIcon from '@patternfly/react-icons/dist/esm/icons/list-icon';
import SyncAltIcon from '@patternfly/react-icons/dist/esm/icons/sync-alt-icon';
import { Table, Tbody, Td, Th, Thead, Tr } from '@patternfly/react-table/dist/esm/components/Table';
import { useEffect, useState } from 'react';
import { call } from '../api/client';
import type { LogEvent } from '../api/types';
import { lastOffset, Pager } from '../directory/list';
import { formatExactTime, formatTime, t } from '../texts';
import { ErrorAlert, Loading, PageHeader, usePoll } from '../ui';

const kPage = 100;
const kInformation = 1;
const kMembership = 2;

function LevelLabel({ level }: { level: number }) {
  return level === kInformation ? (
    <Label status="info" variant="outline">
      {t('events.level.information')}
    </Label>
  ) : (
    <Label status="warning" variant="outline">
      {t('events.level.other', { level: String(level) })}
    </Label>
  );
}

function EventTable({ events, busy }: { events: LogEvent[]; busy: boolean }) {
  return (
    <div className={busy ? 'vorn-list vorn-list--stale' : 'vorn-list'} aria-busy={busy}>
      <Table role="table" variant="compact" aria-label={t('events.title')}>
        <Thead>
          <Tr>
            <Th modifier="nowrap">{t('events.time')}</Th>
            <Th modifier="nowrap">{t('events.level')}</Th>
            <Th modifier="nowrap">{t('events.kind')}</Th>
            <Th>{t('events.text')}</Th>
            <Th modifier="nowrap">{t('events.code')}</Th>
          </Tr>
        </Thead>
        <Tbody>
          {events.map((event, index) => (
            // Events have no id of their own, and two may be alike: the place is what tells them apart.
            <Tr key={index}>
              <Td dataLabel={t('events.time')} modifier="nowrap">
                <time
                  dateTime={new Date(event.time * 1000).toISOString()}
                  title={formatExactTime(event.time)}
                >
                  {formatTime(event.time)}
                </time>
              </Td>
              <Td dataLabel={t('events.level')}>
                <LevelLabel level={event.level} />
              </Td>
              <Td dataLabel={t('events.kind')} modifier="nowrap">
                {event.kind === kMembership
                  ? t('events.kind.membership')
                  : t('events.kind.other', { kind: String(event.kind) })}
              </Td>
              <Td dataLabel={t('events.text')}>{event.text}</Td>
              <Td
                dataLabel={t('events.code')}
                className="vorn-list__number vorn-list__subtle"
                modifier="nowrap"
              >
                {`0x${(event.code >>> 0).toString(16).padStart(8, '0')}`}
              </Td>
            </Tr>
          ))}
        </Tbody>
      </Table>
    </div>
  );
}

export default function EventsPage() {
  const [offset, setOffset] = useState(0);
  const { data, error, loading, busy, reload } = usePoll(
    async (options) => ({ offset, ...(await call('events.list', { offset, limit: kPage }, options)) }),
    String(offset),
    { keep: true },
  );
  const total = data?.total ?? 0;
  // The page that is shown may still be the one before.
  const shown = data?.offset ?? 0;
  const page = { offset, size: kPage, total, onOffset: setOffset, label: t('events.pages') };

  // The log may have become shorter than the page that is shown.
  useEffect(() => {
    if (data !== undefined && data.events.length === 0 && offset > lastOffset({ size: kPage, total })) {
      setOffset(lastOffset({ size: kPage, total }));
    }
  }, [data, offset, total]);

  return (
    <div className="vorn-page">
      <PageHeader
        title={t('events.title')}
        description={t('events.intro')}
        actions={
          <Button
            variant="secondary"
            icon={<SyncAltIcon />}
            isLoading={busy}
            isAriaDisabled={busy}
            onClick={() => {
              setOffset(0);
              reload();
            }}
          >
            {t('list.reload')}
          </Button>
        }
      />
      {error !== undefined && <ErrorAlert error={error} title={t('events.failed')} onRetry={reload} />}
      {loading && <Loading text={t('events.loading')} />}
      {data !== undefined && total === 0 && (
        <EmptyState titleText={t('events.empty')} headingLevel="h2" icon={ListIcon} variant="sm">
          <EmptyStateBody>{t('events.empty.body')}</EmptyStateBody>
        </EmptyState>
      )}
      {data !== undefined && total > 0 && (
        <>
          <div className="vorn-list__tools">
            <Pager
              {...page}
              words={t('events.shown', { first: shown + 1, last: shown + data.events.length, count: total })}
            />
          </div>
          <EventTable events={data.events} busy={busy} />
          <div className="vorn-list__end">
            <Pager {...page} label={t('events.pages.end')} />
          </div>
        </>
      )}
    </div>
  );
}
